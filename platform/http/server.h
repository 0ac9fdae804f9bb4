// The HTTP/1.1 server of the API transport: listeners on an IPv4 and an IPv6
// endpoint feeding sessions (session.h) that hand each request to one
// HttpCallHandler.
//
// The server does not run the I/O context; its owner does. Construct and
// Listen() before the I/O threads start; destroy after they have stopped.
// Serve() is thread-safe.
#pragma once

#include <boost/asio/io_context.hpp>
#include <boost/asio/ip/tcp.hpp>
#include <memory>

#include "platform/http/listener.h"
#include "platform/http/server_config.h"
#include "platform/http/session.h"
#include "platform/lumo/transport_call.h"

namespace Lumo::Transport::PicoHttp {

class Server {
 public:
  // Logs the configuration once (ToString) at information level.
  Server(boost::asio::io_context& io, ServerConfig config, HttpCallHandler handler);
  ~Server();  // closes the listeners
  Server(const Server&) = delete;
  Server& operator=(const Server&) = delete;

  struct ListenResult {
    boost::system::error_code ipv4;
    boost::system::error_code ipv6;
    bool Any() const { return !ipv4 || !ipv6; }
  };
  // Opens the IPv4 listener, then the IPv6 one; a failure of one does not
  // stop the other. When both configured ports are 0, the IPv6 listener takes
  // the port the IPv4 one was given, so one port serves both families.
  ListenResult Listen();

  // The bound endpoints of the listeners that opened.
  const boost::asio::ip::tcp::endpoint& Endpoint4() const { return listener4_->LocalEndpoint(); }
  const boost::asio::ip::tcp::endpoint& Endpoint6() const { return listener6_->LocalEndpoint(); }

  // Serves an accepted connection; its socket should carry a strand.
  void Serve(boost::asio::ip::tcp::socket socket);

  // Stops accepting (not while I/O threads run).
  void Close();

 private:
  std::shared_ptr<const ServerContext> context_;
  std::shared_ptr<Listener> listener4_;
  std::shared_ptr<Listener> listener6_;
};

}  // namespace Lumo::Transport::PicoHttp
