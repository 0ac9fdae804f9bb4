// The endpoint's listeners on the loopback addresses, its start and stop.
// (Falling back to IPv4 alone and failing when neither address is free are
// shown by the daemon's end-to-end tests.)
#include "api/endpoint.h"

#include <gtest/gtest.h>

#include <condition_variable>
#include <cstdlib>
#include <mutex>
#include <thread>

#include "daemon/logger.h"
#include "platform/runtime/app.h"
#include "tests/support/log_capture.h"
#include "tests/support/raw_http_client.h"
#include "tests/support/time_scale.h"

namespace {

std::string Served(const std::string& address, uint32_t port) {
  ZyrdTest::RawHttpClient client(static_cast<uint16_t>(port), address);
  client.Send(
      "POST /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 2\r\n\r\n{}");
  return client.ReadResponse().body;
}

TEST(EndpointTest, ServesBothFamiliesOnOnePortUntilStopped) {
  ZyrdTest::LogCapture log;
  auto logged = [&](const std::string& line) { return log.Has(5, line + "\n"); };
  boost::asio::io_context io;
  Zyrd::ZyrApi::Endpoint endpoint(
      0, io,
      [](auto, auto done) {
        done({"ok", ""});
      },
      std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level));
  EXPECT_TRUE(
      logged("ServerConfig{endpoint4:127.0.0.1:0;endpoint6:[::1]:0;Localizer not set;"
             "readTimeout:20 minutes and 0 seconds;writeTimeout:30 minutes and 0 seconds;"
             "httpBodySizeLimitInBytes:2500000;ProtocolHandlerSpec::extractors not set}"));
  ASSERT_TRUE(endpoint.Start());
  const std::string port = std::to_string(endpoint.Port());
  ASSERT_NE(endpoint.Port(), 0u);
  EXPECT_TRUE(logged("Listening on: 127.0.0.1:" + port));
  EXPECT_TRUE(logged("Listening on: [::1]:" + port));
  EXPECT_TRUE(logged("HTTP endpoint listening on TCP port " + port));
  EXPECT_EQ(Served("127.0.0.1", endpoint.Port()), "ok");
  EXPECT_EQ(Served("::1", endpoint.Port()), "ok");
  endpoint.Stop();
  endpoint.Stop();
  EXPECT_EQ(log.Count("Failed to listen"), 0u);
}

// A pool set smaller than the workers still runs all five at once: five
// requests that each wait for the others all get through.
TEST(EndpointTest, EveryWorkerRunsWhateverThePoolSize) {
  ZyrdTest::LogCapture log;
  auto config = Strake::Service::CreateScratchConfig();
  config->SetInt("strake/threadPool/maxThreads", 2);
  try {
    Strake::Service::InitApp(config, "/nonexistent/config.xml");
  } catch (const std::exception&) {
  }
  std::mutex mutex;
  std::condition_variable cv;
  int arrived = 0;
  const auto patience = ZyrdTest::Scaled(std::chrono::seconds(5));
  boost::asio::io_context io;
  Zyrd::ZyrApi::Endpoint endpoint(
      0, io,
      [&](auto, auto done) {
        std::unique_lock<std::mutex> lock(mutex);
        ++arrived;
        cv.notify_all();
        bool all = cv.wait_for(lock, patience, [&] { return arrived >= 5; });
        done({all ? "all" : "short", ""});
      },
      std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level));
  ASSERT_TRUE(endpoint.Start());
  EXPECT_EQ(log.Count("Thread pool raised from 2 to 5 threads"), 1u);
  std::vector<std::thread> clients;
  std::vector<std::string> answers(5);
  for (int i = 0; i < 5; ++i) {
    clients.emplace_back([&, i] { answers[i] = Served("127.0.0.1", endpoint.Port()); });
  }
  for (auto& t : clients) t.join();
  EXPECT_EQ(answers, std::vector<std::string>(5, "all"));
  endpoint.Stop();
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
