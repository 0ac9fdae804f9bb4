// The endpoint's listeners on the loopback addresses, its start and stop.
#include "api/endpoint.h"

#include <gtest/gtest.h>

#include <cstdlib>

#include "daemon/logger.h"
#include "tests/support/log_capture.h"
#include "tests/support/raw_http_client.h"

namespace {

namespace asio = boost::asio;
using asio::ip::tcp;
using Zyrd::ZyrApi::Endpoint;

const char kRequest[] =
    "POST /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 2\r\n\r\n{}";

// A listening socket that holds an address and port for the whole test.
struct Occupier {
  Occupier(asio::io_context& io, const std::string& address, uint16_t port)
      : acceptor(io, tcp::endpoint(asio::ip::make_address(address), port)) {}
  uint16_t Port() const { return acceptor.local_endpoint().port(); }
  tcp::acceptor acceptor;
};

class EndpointTest : public ::testing::Test {
 protected:
  std::unique_ptr<Endpoint> MakeEndpoint(uint32_t port) {
    return std::make_unique<Endpoint>(
        port, io_,
        [](auto, std::function<void(Lumo::Transport::HttpCallResult)> done) {
          done({"ok", ""});
        },
        std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level));
  }

  static std::string Served(const std::string& address, uint32_t port) {
    ZyrdTest::RawHttpClient client(address, static_cast<uint16_t>(port));
    client.Send(kRequest);
    return client.ReadResponse().body;
  }

  ZyrdTest::LogCapture log_;
  asio::io_context io_;
  asio::io_context scratch_;  // for occupying sockets
};

TEST_F(EndpointTest, LogsItsServerConfigOnce) {
  auto endpoint = MakeEndpoint(7888);
  EXPECT_TRUE(
      log_.Has(5,
               "ServerConfig{endpoint4:127.0.0.1:7888;endpoint6:[::1]:7888;Localizer not set;"
               "readTimeout:20 minutes and 0 seconds;writeTimeout:30 minutes and 0 seconds;"
               "httpBodySizeLimitInBytes:2500000;ProtocolHandlerSpec::extractors not set}\n"));
  EXPECT_EQ(log_.Count("ServerConfig{"), 1u);
}

TEST_F(EndpointTest, ServesBothFamiliesOnOnePortUntilStopped) {
  auto endpoint = MakeEndpoint(0);
  ASSERT_TRUE(endpoint->Start());
  const uint32_t port = endpoint->Port();
  ASSERT_NE(port, 0u);
  EXPECT_TRUE(log_.Has(5, "Listening on: 127.0.0.1:" + std::to_string(port) + "\n"));
  EXPECT_TRUE(log_.Has(5, "Listening on: [::1]:" + std::to_string(port) + "\n"));
  EXPECT_TRUE(log_.Has(5, "HTTP endpoint listening on TCP port " + std::to_string(port) + "\n"));
  EXPECT_EQ(Served("127.0.0.1", port), "ok");
  EXPECT_EQ(Served("::1", port), "ok");
  endpoint->Stop();
  endpoint->Stop();
  endpoint.reset();
  EXPECT_EQ(log_.Count("Failed to listen"), 0u);
}

TEST_F(EndpointTest, WithoutIpv6TheIpv4ListenerServesAlone) {
  Occupier v6(scratch_, "::1", 0);
  auto endpoint = MakeEndpoint(v6.Port());
  ASSERT_TRUE(endpoint->Start());
  const std::string port = std::to_string(v6.Port());
  EXPECT_TRUE(log_.Has(5, "IPv6 Failed to listen on: [::1]:" + port + " ec: system:98\n"));
  EXPECT_TRUE(log_.Has(5, "HTTP endpoint listening on TCP port " + port + "\n"));
  EXPECT_EQ(Served("127.0.0.1", v6.Port()), "ok");
}

TEST_F(EndpointTest, StartFailsWhenNeitherListenerOpens) {
  Occupier v4(scratch_, "127.0.0.1", 0);
  Occupier v6(scratch_, "::1", v4.Port());
  auto endpoint = MakeEndpoint(v4.Port());
  EXPECT_FALSE(endpoint->Start());
  const std::string port = std::to_string(v4.Port());
  EXPECT_TRUE(log_.Has(5, "IPv4 Failed to listen on: 127.0.0.1:" + port + " ec: system:98\n"));
  EXPECT_TRUE(log_.Has(5, "IPv6 Failed to listen on: [::1]:" + port + " ec: system:98\n"));
  EXPECT_EQ(log_.Count("HTTP endpoint listening"), 0u);
}

TEST(HttpPortFromEnvironment, TakesAPortNumberOnly) {
  ZyrdTest::LogCapture log;
  auto portFor = [](const char* value) {
    if (value) {
      setenv("ZYRD_HTTP_PORT", value, 1);
    } else {
      unsetenv("ZYRD_HTTP_PORT");
    }
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
