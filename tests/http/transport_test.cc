// The HTTP transport over real loopback connections: bytes in, bytes out.
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <boost/asio/executor_work_guard.hpp>
#include <boost/json.hpp>
#include <mutex>
#include <thread>

#include "daemon/logger.h"
#include "platform/http/server.h"
#include "tests/support/freed_memory_scan.h"
#include "tests/support/log_capture.h"
#include "tests/support/raw_http_client.h"

namespace {

using Lumo::Transport::HttpCall;
using Lumo::Transport::HttpCallResult;
using ZyrdTest::RawHttpClient;
namespace asio = boost::asio;
using Respond = std::function<void(std::shared_ptr<HttpCall>, std::function<void(HttpCallResult)>)>;

std::string Post(std::string_view body, std::string_view headers = "",
                 std::string_view contentType = "application/json") {
  return "POST /api HTTP/1.1\r\nHost: localhost\r\nContent-Type: " + std::string(contentType) +
         "\r\nContent-Length: " + std::to_string(body.size()) + "\r\n" + std::string(headers) +
         "\r\n" + std::string(body);
}

std::string Ok(std::string_view body, std::string_view connection = "Keep-Alive") {
  return "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) +
         "\r\nContent-Type: application/json\r\nConnection: " + std::string(connection) +
         "\r\nServer: LUMO-PicoHttp\r\n\r\n" + std::string(body);
}

class TransportTest : public ::testing::Test {
 protected:
  void SetUp() override { StartServer(); }
  void TearDown() override { StopServer(); }

  void StartServer(std::chrono::milliseconds readTimeout = std::chrono::minutes(20)) {
    StopServer();
    Lumo::Transport::ServerConfig config;
    config.endpoint4 = {asio::ip::make_address("127.0.0.1"), 0};
    config.endpoint6 = {asio::ip::make_address("::1"), 0};
    config.logger = std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level);
    config.lingerTimeout = std::chrono::milliseconds(500);
    config.readTimeout = readTimeout;
    auto handler = [this](std::shared_ptr<HttpCall> call, auto done) {
      {
        std::lock_guard<std::mutex> lock(mutex_);
        calls_.push_back(*call);
      }
      respond_(call, std::move(done));
    };
    server_ = std::make_unique<Lumo::Transport::PicoHttp::Server>(io_, std::move(config), handler);
    ASSERT_FALSE(server_->Listen().ipv4);
    port_ = server_->Endpoint4().port();
    io_.restart();
    work_.emplace(io_.get_executor());
    for (int i = 0; i < 2; ++i) threads_.emplace_back([this] { io_.run(); });
  }

  void StopServer() {
    work_.reset();
    io_.stop();
    for (auto& t : threads_) t.join();
    threads_.clear();
    server_.reset();
  }

  std::vector<HttpCall> Calls() {
    std::lock_guard<std::mutex> lock(mutex_);
    return calls_;
  }

  // A refused request: status 400, text/plain, close, and a JSON-RPC error body.
  void ExpectRefusal(RawHttpClient& client, const std::string& name) {
    ZyrdTest::RawResponse r = client.ReadResponse();
    EXPECT_EQ(r.head,
              "HTTP/1.1 400 Bad Request\r\nContent-Length: " + std::to_string(r.body.size()) +
                  "\r\nContent-Type: text/plain\r\nConnection: close\r\n"
                  "Server: LUMO-PicoHttp\r\n\r\n");
    auto error = boost::json::parse(r.body).at("error");
    EXPECT_EQ(error.at("code").as_int64(), 400);
    EXPECT_EQ(error.at("data").at("name").as_string(), name);
    EXPECT_FALSE(error.at("message").as_string().empty());
    EXPECT_TRUE(client.PeerClosed());
  }

  ZyrdTest::LogCapture log_;
  asio::io_context io_;
  std::optional<asio::executor_work_guard<asio::io_context::executor_type>> work_;
  std::vector<std::thread> threads_;
  std::unique_ptr<Lumo::Transport::PicoHttp::Server> server_;
  uint16_t port_ = 0;
  std::mutex mutex_;
  std::vector<HttpCall> calls_;
  // Answers "echo:" and the request body unless a test says otherwise.
  Respond respond_ = [](auto call, auto done) { done({"echo:" + call->body, ""}); };
};

TEST_F(TransportTest, CallsCarryHeadersAndBodyAndManyShareOneConnection) {
  RawHttpClient client(port_);
  client.Send(Post("{\"a\":1}",
                   "authorization: Bearer tok.en\r\nAccept-Language: en_US\r\n"
                   "Accept: application/json\r\n"));
  EXPECT_EQ(client.ReadExactly(Ok("echo:{\"a\":1}").size()), Ok("echo:{\"a\":1}"));
  auto calls = Calls();
  ASSERT_EQ(calls.size(), 1u);
  EXPECT_EQ(calls[0].authorization, "Bearer tok.en");
  EXPECT_EQ(calls[0].acceptLanguage, "en_US");
  EXPECT_EQ(calls[0].responseCode, 1);
  EXPECT_EQ(calls[0].peer.rfind("127.0.0.1:", 0), 0u);

  for (int i = 0; i < 50; ++i) {
    std::string body = "{\"n\":" + std::to_string(i) + "}";
    client.Send(Post(body));
    ASSERT_EQ(client.ReadResponse().body, "echo:" + body);
  }
  client.Send(Post("first") + Post("second"));  // pipelined
  EXPECT_EQ(client.ReadResponse().body, "echo:first");
  EXPECT_EQ(client.ReadResponse().body, "echo:second");
  EXPECT_EQ(Calls().size(), 53u);

  client.Send(Post("{}", "Connection: keep-alive, Close\r\n"));
  EXPECT_EQ(client.ReadExactly(Ok("echo:{}", "close").size()), Ok("echo:{}", "close"));
  EXPECT_TRUE(client.PeerClosed());
}

// What a request and its answer carry (token, body) is overwritten before the
// server's threads release or reuse its memory.
TEST_F(TransportTest, RequestAndResponseBytesAreWipedBeforeTheirMemoryIsReleased) {
  const std::string token = "Bearer token-3c9e51d07a2b4f68",
                    asked = "request-body-81f6d2c4a9e03b57",
                    answer = "response-body-5a0e7c93d1b64f28";
  respond_ = [&answer](auto, auto done) {
    std::string body;
    body.reserve(answer.size() * 100);
    for (int i = 0; i < 100; ++i) body.append(answer);
    done({std::move(body), ""});
  };
  const std::string request = Post(asked, "Authorization: " + token + "\r\nConnection: close\r\n");
  ZyrdTest::FreedMemoryScan scan({token, asked, answer},
                                 ZyrdTest::FreedMemoryScan::Threads::kOthers);
  RawHttpClient client(port_);
  client.Send(request);
  EXPECT_EQ(client.ReadResponse().body.size(), answer.size() * 100);
  EXPECT_TRUE(client.PeerClosed());
  StopServer();  // the closed session is released on a server thread before this returns
  EXPECT_EQ(scan.Stop(), 0);
}

TEST_F(TransportTest, ErrorResultCarriesLumoErrorHeader) {
  respond_ = [](auto, auto done) { done({"{}", "com.tarsel.lumo.std.errors.not_found"}); };
  RawHttpClient client(port_);
  client.Send(Post("{}", "Accept: application/vnd.tarsel.lumo.cleanjson\r\n"));
  EXPECT_EQ(client.ReadResponse().head,
            "HTTP/1.1 200 OK\r\nContent-Length: 2\r\n"
            "Content-Type: application/vnd.tarsel.lumo.cleanjson\r\nConnection: Keep-Alive\r\n"
            "lumo-error: com.tarsel.lumo.std.errors.not_found\r\nServer: LUMO-PicoHttp\r\n\r\n");
  EXPECT_EQ(Calls().at(0).responseCode, 2);
}

TEST_F(TransportTest, ExpectationsAndDeclaredBodiesOfGet) {
  for (std::string value : {"100-continue", "100-Continue", "100-CONTINUE"}) {
    RawHttpClient client(port_);
    client.Send(
        "POST /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 2\r\n"
        "Expect: " +
        value + "\r\n\r\n");
    EXPECT_EQ(client.ReadExactly(25), "HTTP/1.1 100 Continue\r\n\r\n") << value;
    client.Send("{}");
    EXPECT_EQ(client.ReadResponse().body, "echo:{}") << value;
  }
  RawHttpClient other(port_);
  other.Send(
      "POST /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 2\r\n"
      "Expect: 200-ok\r\n\r\n{}");
  EXPECT_EQ(other.ReadToEnd(),
            "HTTP/1.1 417 Expectation Failed\r\nConnection: close\r\nContent-Length: 0\r\n\r\n");
  EXPECT_EQ(Calls().size(), 3u);

  RawHttpClient get(port_);
  get.Send("GET /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 10\r\n\r\n");
  EXPECT_EQ(get.ReadResponse().body, "echo:");
}

// The bodies are never sent: the answer comes from the head alone.
TEST_F(TransportTest, UnsupportedContentTypesAndSizesAreRefusedFromTheHead) {
  const std::string cleanJson = "application/vnd.tarsel.lumo.cleanjson";
  const std::pair<std::string, const char*> cases[] = {
      {Post("<a/>", "", "text/xml"), "invalid_content_type"},
      {"POST /api HTTP/1.1\r\nContent-Type: " + cleanJson + "\r\nContent-Length: 2500001\r\n\r\n",
       "request_exceeds_max_size"},
      {"POST /api HTTP/1.1\r\nContent-Type: " + cleanJson + "\r\nContent-Length: 2500000\r\n\r\n",
       "invalid_request"},
      {"POST /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 2500001\r\n\r\n",
       "request_exceeds_max_size"},
      {Post("{}", "", "application/json; x=vnd.tarsel.lumo.framed"), "invalid_request"},
  };
  for (const auto& [request, name] : cases) {
    RawHttpClient client(port_);
    client.Send(request);
    ExpectRefusal(client, name);
  }
  EXPECT_TRUE(Calls().empty());
}

TEST_F(TransportTest, UnusableHeadsGetTheCanned400) {
  for (const std::string& head : {
           std::string("\x16\x03\x01garbage\r\n\r\n"),
           std::string("POST /api HTTP/1.1\r\nContent-Type: application/json\r\n"
                       "Content-Length: 1x\r\n\r\n"),
           "POST /api HTTP/1.1\r\nX: " + std::string(70'000, 'a') + "\r\n\r\n",
       }) {
    RawHttpClient client(port_);
    client.Send(head);
    EXPECT_EQ(client.ReadToEnd(),
              "HTTP/1.1 400 Bad Request\r\nContent-Length: 0\r\nConnection: close\r\n"
              "Server: LUMO-PicoHttp\r\n\r\n");
  }
  EXPECT_TRUE(Calls().empty());
}

TEST_F(TransportTest, ChunkedRequestBodiesAreDecodedAndLimitedWhileArriving) {
  const std::string head =
      "POST /api HTTP/1.1\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\n\r\n";
  RawHttpClient client(port_);
  client.Send(head + "4\r\n{\"a\"\r\n3;ext=1\r\n:1}\r\n0\r\n\r\n");
  EXPECT_EQ(client.ReadResponse().body, "echo:{\"a\":1}");

  // The limit is the same as for a declared length: 2,500,000 bytes pass,
  // one more does not.
  std::string atLimit = head;
  const std::string chunk(100'000, 'x');
  for (int i = 0; i < 25; ++i) atLimit += "186a0\r\n" + chunk + "\r\n";
  EXPECT_TRUE(client.Send(atLimit + "0\r\n\r\n"));
  EXPECT_EQ(client.ReadResponse().body.size(), 5 + 2'500'000u);
  RawHttpClient over(port_);
  EXPECT_TRUE(over.Send(atLimit + "1\r\nx\r\n0\r\n\r\n"));
  ExpectRefusal(over, "request_exceeds_max_size");
  EXPECT_EQ(Calls().size(), 2u);
}

TEST_F(TransportTest, StreamedResponseIsChunkedIn64KiBPieces) {
  const std::string body(100'000, 'k');
  respond_ = [&body](auto, auto done) { done({body, ""}); };
  RawHttpClient client(port_);
  client.Send(
      Post("{}", "Accept: application/vnd.tarsel.lumo.stream.json\r\nConnection: close\r\n"));
  EXPECT_EQ(client.ReadToEnd(),
            "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n"
            "Content-Type: application/vnd.tarsel.lumo.stream.json\r\nConnection: close\r\n"
            "Server: LUMO-PicoHttp\r\n\r\n10000\r\n" +
                body.substr(0, 65536) + "\r\n86a0\r\n" + body.substr(65536) + "\r\n0\r\n\r\n");
}

TEST_F(TransportTest, FailedHandlingIsAnsweredWithInternalServerError) {
  int mode = 0;
  respond_ = [&mode](auto, std::function<void(HttpCallResult)> done) {
    if (mode == 0) throw std::runtime_error("boom");
    if (mode == 1) return;  // drops the completion
    done({"first", ""});
    done({"second", ""});
  };
  RawHttpClient client(port_);
  for (mode = 0; mode < 2; ++mode) {
    client.Send(Post("{}"));
    ZyrdTest::RawResponse r = client.ReadResponse();
    EXPECT_NE(r.head.find("lumo-error: com.tarsel.lumo.std.errors.internal_server_error\r\n"),
              std::string::npos);
    EXPECT_EQ(boost::json::parse(r.body).at("result").at("error").at("errorType").as_string(),
              "INTERNAL_SERVER_ERROR");
  }
  client.Send(Post("{}"));
  EXPECT_EQ(client.ReadResponse().body, "first");
  // The second completion wrote nothing: the next response is the next call's.
  respond_ = [](auto, auto done) { done({"next", ""}); };
  client.Send(Post("{}"));
  EXPECT_EQ(client.ReadResponse().body, "next");
}

TEST_F(TransportTest, IdleConnectionIsClosedAfterReadTimeout) {
  StartServer(std::chrono::milliseconds(100));
  RawHttpClient client(port_);
  client.Send("POST /api HTTP/1.1\r\n");
  EXPECT_TRUE(client.PeerClosed());
}

// With every descriptor taken, accepting pauses and is retried; it resumes as
// soon as a descriptor is free again.
TEST_F(TransportTest, AcceptingResumesAfterDescriptorsRunOut) {
  rlimit saved{};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &saved), 0);
  RawHttpClient client(port_, "127.0.0.1", /*connectNow=*/false);
  rlimit low = saved;
  low.rlim_cur = std::min<rlim_t>(saved.rlim_cur, 512);
  ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &low), 0);
  std::vector<int> fillers;
  for (int fd; (fd = dup(STDERR_FILENO)) >= 0;) fillers.push_back(fd);

  client.Connect();  // queued by the kernel; the server has no descriptor for it
  auto retried = [&] { return log_.Count(";DelayAcceptError") >= 2; };
  for (int i = 0; i < 400 && !retried(); ++i) {
    std::this_thread::sleep_for(std::chrono::milliseconds(25));
  }
  for (int fd : fillers) close(fd);
  setrlimit(RLIMIT_NOFILE, &saved);

  ASSERT_TRUE(retried());
  EXPECT_EQ(log_.Count("Accept Error: "), log_.Count(";DelayAcceptError"));
  client.Send(Post("{}"));
  EXPECT_EQ(client.ReadResponse().body, "echo:{}");
}

}  // namespace
