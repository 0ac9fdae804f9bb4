// One accepted HTTP connection: reads a request head and body, hands the call
// to the server's handler, writes its response, and then reads the next
// request or closes. One request at a time; every handler of a session runs on
// the session's strand (the executor of its socket), so a session's state is
// never touched by two threads at once. A session keeps itself alive through
// the handlers it has pending and ends when the connection closes.
#pragma once

#include <boost/asio/ip/tcp.hpp>
#include <boost/beast/core/flat_buffer.hpp>
#include <boost/beast/core/tcp_stream.hpp>
#include <chrono>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/http/request_head.h"
#include "platform/http/server_config.h"
#include "platform/lumo/transport_call.h"

namespace Lumo::Transport::PicoHttp {

// Largest request head (request line and headers) and so the read buffer.
inline constexpr size_t kMaxHeadBytes = 64 * 1024;

class Session;

// The open connections of a server, and those of them that wait for a
// request head, longest waiting first. Bounds how many are open at once
// (ServerConfig::maxConnections): a connection beyond the bound makes room
// by closing the one that has waited longest for a head, as idle keep-alive
// connections and heads that never complete are the cheapest to give up.
// Thread-safe.
class Connections {
 public:
  explicit Connections(size_t max) : max_(max) {}
  Connections(const Connections&) = delete;
  Connections& operator=(const Connections&) = delete;

  // Counts `session` as open. Beyond the bound returns the session to close
  // instead: the one waiting longest for a head (taken off the waiting
  // list), or `session` itself when none waits. Null within the bound.
  std::shared_ptr<Session> Open(const std::shared_ptr<Session>& session);
  // The session's connection has gone (from its destructor).
  void Closed(Session& session);
  // The session waits for a request head, or no longer does.
  void Waiting(Session& session);
  void Busy(Session& session);

 private:
  void StopWaiting(Session& session);  // with mutex_ held

  std::mutex mutex_;
  const size_t max_;
  size_t open_ = 0;
  std::list<Session*> waiting_;
};

// What a server shares with its sessions; immutable once serving starts
// (but for the connection count) and kept alive by every session that uses
// it.
struct ServerContext {
  ServerConfig config;
  HttpCallHandler handler;
  std::shared_ptr<Connections> connections;
};

class Session : public std::enable_shared_from_this<Session> {
 public:
  // `socket` should carry a strand executor (accept onto make_strand(io)).
  Session(boost::asio::ip::tcp::socket socket, std::shared_ptr<const ServerContext> context);
  ~Session();
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;

  // Counts the connection among the server's open ones and starts reading
  // the first request, or closes it when it is one too many. Thread-safe.
  void Start();

  // Closes the connection if it is still waiting for a request head: it was
  // chosen to make room for a new one. Thread-safe.
  void Evict();

 private:
  friend class Connections;
  class Completion;
  using Step = void (Session::*)();

  void BeginRequest();
  void ParseHead();
  void OnHead();
  void ReadBody();
  void Dispatch();
  void WriteResult(HttpCallResult result);
  void OnResponseWritten();

  void Read(Step next, bool inBody);
  // Writes `data` (which must stay valid), then goes on with `next`; a failed
  // write closes the connection.
  void Write(boost::asio::const_buffer data, Step next);
  void Refuse(std::string_view name, std::string_view messageId);
  // Writes fixed bytes, then closes the connection while draining the peer.
  void WriteAndLinger(std::string text);
  void LingeringClose();
  void Drain(uint64_t drained);
  void Close();
  void FailRequest(std::string_view context, const boost::system::error_code& ec);
  std::string_view Buffered() const;
  void Consume(size_t n);
  Log::Logger* Logger() const { return context_->config.logger.get(); }

  boost::beast::tcp_stream stream_;
  std::shared_ptr<const ServerContext> context_;
  std::string peer_;
  boost::beast::flat_buffer buffer_;
  std::optional<RequestHeadParser> head_;
  // Set by the first byte of a request: when all of it must have arrived.
  std::optional<std::chrono::steady_clock::time_point> requestDeadline_;
  bool awaitingHead_ = false;
  // Guarded by the mutex of Connections: whether Open counted this session,
  // and its entry in the waiting list.
  bool counted_ = false;
  std::optional<std::list<Session*>::iterator> waitingAt_;
  // The response being written; wiped once written.
  bool keepAlive_ = true;
  bool streamed_ = false;
  int responseCode_ = 1;
  std::string responseHead_;
  std::string responseBody_;
  std::string lumoError_;
  std::vector<std::string> chunkLines_;
  std::string fixedResponse_;
};

}  // namespace Lumo::Transport::PicoHttp
