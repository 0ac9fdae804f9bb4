// A plain HTTP/1.1 server on Boost.Beast that answers every request with the
// fixed reply on kept-alive connections: the yardstick for the endpoint.
// Usage: reference_server [port]   (0 or nothing: a free port)
// Prints "port <n>" once listening; stops on SIGINT or SIGTERM.
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/signal_set.hpp>
#include <boost/asio/strand.hpp>
#include <boost/beast/core.hpp>
#include <boost/beast/http.hpp>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <thread>
#include <vector>

#include "bench/fixed_reply.h"

namespace {

namespace asio = boost::asio;
namespace beast = boost::beast;
namespace http = beast::http;
using asio::ip::tcp;

class Connection : public std::enable_shared_from_this<Connection> {
 public:
  explicit Connection(tcp::socket socket) : stream_(std::move(socket)) {}

  void Read() {
    request_ = {};
    http::async_read(stream_, buffer_, request_,
                     [self = shared_from_this()](beast::error_code ec, size_t) {
                       if (!ec) self->Answer();
                     });
  }

 private:
  void Answer() {
    response_ = {};
    response_.result(http::status::ok);
    response_.version(11);
    response_.set(http::field::content_type, "application/json");
    response_.keep_alive(request_.keep_alive());
    response_.body() = ZyrdBench::kFixedReply;
    response_.prepare_payload();
    http::async_write(stream_, response_,
                      [self = shared_from_this()](beast::error_code ec, size_t) {
                        if (!ec && self->response_.keep_alive()) self->Read();
                      });
  }

  beast::tcp_stream stream_;
  beast::flat_buffer buffer_;
  http::request<http::string_body> request_;
  http::response<http::string_body> response_;
};

void Accept(tcp::acceptor& acceptor, asio::io_context& io) {
  acceptor.async_accept(asio::make_strand(io),
                        [&acceptor, &io](beast::error_code ec, tcp::socket socket) {
                          if (!ec) std::make_shared<Connection>(std::move(socket))->Read();
                          if (ec != asio::error::operation_aborted) Accept(acceptor, io);
                        });
}

}  // namespace

int main(int argc, char** argv) {
  const auto port = static_cast<unsigned short>(argc > 1 ? std::atoi(argv[1]) : 0);
  asio::io_context io;
  tcp::acceptor acceptor(io, tcp::endpoint(asio::ip::make_address("127.0.0.1"), port));
  std::printf("port %u\n", static_cast<unsigned>(acceptor.local_endpoint().port()));
  std::fflush(stdout);
  Accept(acceptor, io);
  asio::signal_set signals(io, SIGINT, SIGTERM);
  signals.async_wait([&io](beast::error_code, int) { io.stop(); });

  // As many threads as the daemon's endpoint runs.
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) threads.emplace_back([&io] { io.run(); });
  io.run();
  for (auto& t : threads) t.join();
  return 0;
}
