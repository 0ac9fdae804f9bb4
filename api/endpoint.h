// The daemon's HTTP endpoint: an IPv4 listener on 127.0.0.1 and an IPv6
// listener on ::1, both on one port, feeding the HTTP transport, which hands
// every call to the API's HttpCallHandler. The endpoint also starts the I/O
// workers, five tasks of the runtime's thread pool that run the I/O context.
//
// Ownership: start-up owns the I/O context and the endpoint and destroys the
// endpoint first. Stop() is thread-safe, idempotent and safe from the signal
// callback; everything else runs on the main thread.
#pragma once

#include <boost/asio/executor_work_guard.hpp>
#include <boost/asio/io_context.hpp>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

#include "platform/http/server.h"
#include "platform/http/server_config.h"
#include "platform/lumo/log.h"
#include "platform/lumo/transport_call.h"

namespace Zyrd::ZyrApi {

class Endpoint {
 public:
  static constexpr uint32_t kDefaultPort = 7888;
  static constexpr int kWorkerCount = 5;
  // At most this many HTTP connections are open at once, and this many
  // descriptors are kept for everything else (store, logs, key servers).
  static constexpr size_t kMaxConnections = 1024;
  static constexpr size_t kReservedDescriptors = 128;

  // The listener and limit settings for `port` (its low 16 bits): 127.0.0.1
  // and ::1, read timeout 20 minutes, 20 seconds for all of a request, write
  // timeout 30 minutes, bodies up to 2,500,000 bytes, and as many connections
  // as ConnectionLimit() allows.
  static Lumo::Transport::ServerConfig MakeServerConfig(uint32_t port,
                                                        std::shared_ptr<Lumo::Log::Logger> logger);

  // Raises the process's soft limit of open descriptors (no further than its
  // hard limit) to what kMaxConnections connections and kReservedDescriptors
  // need, and returns how many connections the limit then allows: at most
  // kMaxConnections, fewer when the hard limit is lower.
  static size_t ConnectionLimit();

  // Builds the server (which logs its configuration once). `handler` serves
  // every call; `logger` receives the transport's messages.
  Endpoint(uint32_t port, boost::asio::io_context& io, Lumo::Transport::HttpCallHandler handler,
           std::shared_ptr<Lumo::Log::Logger> logger);
  // Stops, waits until no worker runs the I/O context any more, and closes
  // the listeners.
  ~Endpoint();
  Endpoint(const Endpoint&) = delete;
  Endpoint& operator=(const Endpoint&) = delete;

  // Opens both listeners; false only when neither opened. Otherwise starts the
  // workers, logs "HTTP endpoint listening on TCP port %d" and returns true.
  bool Start();

  // Stops the I/O context; the workers' run loops return.
  void Stop();

  // The port the listeners serve (resolved when 0 was asked for).
  uint32_t Port() const { return port_; }

 private:
  struct Workers;

  uint32_t port_;
  boost::asio::io_context& io_;
  Lumo::Transport::PicoHttp::Server server_;
  std::shared_ptr<Lumo::Log::Logger> logger_;
  std::shared_ptr<Workers> workers_;
  // Keeps the workers running while no listener or connection has work.
  std::optional<boost::asio::executor_work_guard<boost::asio::io_context::executor_type>> work_;
};

// The port to serve: ZYRD_HTTP_PORT when set (tests only; 0 picks a free
// port), else 7888. A value that is not a port number is logged and ignored.
uint32_t HttpPortFromEnvironment();

}  // namespace Zyrd::ZyrApi
