// One listening TCP socket and its accept loop. Accepted sockets carry a
// strand of their own and go to the callback given at construction.
//
// Open() runs before the I/O threads do; the accept loop then runs on the
// listener's strand. Close() must not race with running I/O threads (call it
// once the I/O context has stopped, or before it runs).
#pragma once

#include <boost/asio/io_context.hpp>
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/steady_timer.hpp>
#include <boost/asio/strand.hpp>
#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "platform/lumo/log.h"

namespace Lumo::Transport::PicoHttp {

// Whether an accept error is passing (descriptors or memory run short: retry
// after kAcceptRetryDelay) rather than the end of this listener.
bool IsDelayAcceptError(const boost::system::error_code& ec);
inline constexpr std::chrono::milliseconds kAcceptRetryDelay{500};

class Listener : public std::enable_shared_from_this<Listener> {
 public:
  using AcceptCallback = std::function<void(boost::asio::ip::tcp::socket)>;

  // `family` names the listener in its log lines ("IPv4", "IPv6").
  Listener(boost::asio::io_context& io, std::string family, std::shared_ptr<Log::Logger> logger,
           AcceptCallback onAccept);
  Listener(const Listener&) = delete;
  Listener& operator=(const Listener&) = delete;

  // Opens the socket (SO_REUSEADDR; IPV6_V6ONLY for IPv6), binds, listens
  // with a backlog of 128, records the bound endpoint, logs "Listening on: "
  // and starts accepting. On failure logs "<family> Failed to listen on: ...
  // ec: <category>:<number>" and returns the error.
  boost::system::error_code Open(const boost::asio::ip::tcp::endpoint& endpoint);

  // The bound endpoint after a successful Open (a port of 0 resolved).
  const boost::asio::ip::tcp::endpoint& LocalEndpoint() const { return endpoint_; }

  void Close();

 private:
  void Accept();
  void OnAccept(const boost::system::error_code& ec, boost::asio::ip::tcp::socket socket);

  boost::asio::io_context& io_;
  boost::asio::strand<boost::asio::io_context::executor_type> strand_;
  boost::asio::ip::tcp::acceptor acceptor_;
  boost::asio::steady_timer delay_;
  std::string family_;
  std::shared_ptr<Log::Logger> logger_;
  AcceptCallback onAccept_;
  boost::asio::ip::tcp::endpoint endpoint_;
  bool closed_ = false;
};

}  // namespace Lumo::Transport::PicoHttp
