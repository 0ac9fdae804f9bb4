// The endpoint's listeners on the loopback addresses, its start and stop.
#include "api/endpoint.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <list>

#include "daemon/logger.h"
#include "tests/support/log_capture.h"
#include "tests/support/raw_http_client.h"

namespace {

namespace asio = boost::asio;
using asio::ip::tcp;

class EndpointTest : public ::testing::Test {
 protected:
  std::unique_ptr<Zyrd::ZyrApi::Endpoint> MakeEndpoint(uint32_t port) {
    return std::make_unique<Zyrd::ZyrApi::Endpoint>(
        port, io_,
        [](auto, auto done) {
          done({"ok", ""});
        },
        std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level));
  }
  static std::string Served(const std::string& address, uint32_t port) {
    ZyrdTest::RawHttpClient client(static_cast<uint16_t>(port), address);
    client.Send(
        "POST /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 2\r\n\r\n{}");
    return client.ReadResponse().body;
  }
  // Holds an address and port for the rest of the test.
  uint16_t Occupy(const std::string& address, uint16_t port) {
    held_.emplace_back(scratch_, tcp::endpoint(asio::ip::make_address(address), port));
    return held_.back().local_endpoint().port();
  }
  bool Logged(const std::string& line) { return log_.Has(5, line + "\n"); }

  ZyrdTest::LogCapture log_;
  asio::io_context io_;
  asio::io_context scratch_;
  std::list<tcp::acceptor> held_;
};

TEST_F(EndpointTest, ServesBothFamiliesOnOnePortUntilStopped) {
  auto endpoint = MakeEndpoint(0);
  EXPECT_TRUE(
      Logged("ServerConfig{endpoint4:127.0.0.1:0;endpoint6:[::1]:0;Localizer not set;"
             "readTimeout:20 minutes and 0 seconds;writeTimeout:30 minutes and 0 seconds;"
             "httpBodySizeLimitInBytes:2500000;ProtocolHandlerSpec::extractors not set}"));
  ASSERT_TRUE(endpoint->Start());
  const std::string port = std::to_string(endpoint->Port());
  ASSERT_NE(endpoint->Port(), 0u);
  EXPECT_TRUE(Logged("Listening on: 127.0.0.1:" + port));
  EXPECT_TRUE(Logged("Listening on: [::1]:" + port));
  EXPECT_TRUE(Logged("HTTP endpoint listening on TCP port " + port));
  EXPECT_EQ(Served("127.0.0.1", endpoint->Port()), "ok");
  EXPECT_EQ(Served("::1", endpoint->Port()), "ok");
  endpoint->Stop();
  endpoint->Stop();
  EXPECT_EQ(log_.Count("Failed to listen"), 0u);
}

TEST_F(EndpointTest, ServesOnIpv4AloneAndFailsOnlyWhenNeitherListenerOpens) {
  const uint16_t v6Only = Occupy("::1", 0);
  auto endpoint = MakeEndpoint(v6Only);
  ASSERT_TRUE(endpoint->Start());
  EXPECT_TRUE(
      Logged("IPv6 Failed to listen on: [::1]:" + std::to_string(v6Only) + " ec: system:98"));
  EXPECT_EQ(Served("127.0.0.1", v6Only), "ok");

  const uint16_t both = Occupy("127.0.0.1", 0);
  Occupy("::1", both);
  EXPECT_FALSE(MakeEndpoint(both)->Start());
  const std::string port = std::to_string(both);
  EXPECT_TRUE(Logged("IPv4 Failed to listen on: 127.0.0.1:" + port + " ec: system:98"));
  EXPECT_TRUE(Logged("IPv6 Failed to listen on: [::1]:" + port + " ec: system:98"));
  EXPECT_EQ(log_.Count("HTTP endpoint listening on TCP port " + port), 0u);
}

TEST(HttpPortFromEnvironment, TakesAPortNumberOnly) {
  ZyrdTest::LogCapture log;
  auto portFor = [](const char* value) {
    if (value) setenv("ZYRD_HTTP_PORT", value, 1);
    uint32_t port = Zyrd::ZyrApi::HttpPortFromEnvironment();
    unsetenv("ZYRD_HTTP_PORT");
    return port;
  };
  EXPECT_EQ(portFor(nullptr), 7888u);
  EXPECT_EQ(portFor("0"), 0u);
  EXPECT_EQ(portFor("65535"), 65535u);
  EXPECT_EQ(log.Count("Ignoring ZYRD_HTTP_PORT"), 0u);
  for (const char* bad : {"", "65536", "80x", "-1", " 80"}) EXPECT_EQ(portFor(bad), 7888u) << bad;
  EXPECT_EQ(log.Count("Ignoring ZYRD_HTTP_PORT"), 5u);
}

}  // namespace
