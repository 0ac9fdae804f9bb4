// Scriptable TCP servers on 127.0.0.1 for tests: a generic accept loop, a
// fake KMIP server over TLS, and a relay that counts connections and can act
// as an HTTP CONNECT proxy.
//
// Every server listens on a free port from the moment it is constructed and
// stops (listening socket closed, open connections shut down, threads joined)
// when destroyed. Accessors are thread-safe.
#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <vector>

namespace ZyrdTest {

// Accepts connections and runs `handler` for each on its own thread. The
// handler owns nothing: the server closes the socket after it returns. A
// handler blocked in reading returns when the server stops, because every
// open connection is shut down then.
class LoopbackServer {
 public:
  using Handler = std::function<void(int fd)>;

  // Listens on 127.0.0.1, or on ::1 when `ipv6` is set.
  explicit LoopbackServer(Handler handler, bool ipv6 = false);
  ~LoopbackServer();
  LoopbackServer(const LoopbackServer&) = delete;
  LoopbackServer& operator=(const LoopbackServer&) = delete;

  uint16_t port() const { return port_; }
  // Connections accepted so far.
  size_t connections() const { return accepted_.load(); }
  void Stop();

 private:
  void AcceptLoop();

  Handler handler_;
  int listen_fd_ = -1;
  int stop_fd_ = -1;
  uint16_t port_ = 0;
  std::atomic<size_t> accepted_{0};
  std::thread acceptor_;
  std::mutex mutex_;
  std::set<int> open_;
  std::vector<std::thread> workers_;
  std::atomic<bool> stopped_{false};
};

// What the fake KMIP server does with one request.
struct FakeReply {
  std::vector<uint8_t> bytes;  // sent as they are (may be malformed)
  size_t sendOnly = SIZE_MAX;  // send only this many bytes of them
  bool close = false;          // close the connection after sending
  bool silent = false;         // send nothing and never answer again
};

// A KMIP server over TLS whose answers come from a handler. The handler
// receives each request message (header and value) as it came. It presents
// the certificate and key of a name of the test PKI (tests/support/kmip_env.h).
// In kNoHandshake mode connections are accepted and never answered (not even
// the TLS handshake).
class FakeKmipServer {
 public:
  using Handler = std::function<FakeReply(const std::vector<uint8_t>& request)>;
  enum class Mode { kTls, kNoHandshake };

  explicit FakeKmipServer(Handler handler, const std::string& pkiName = "server",
                          Mode mode = Mode::kTls, bool ipv6 = false);
  ~FakeKmipServer();

  uint16_t port() const { return server_.port(); }
  size_t connections() const { return server_.connections(); }
  std::vector<std::vector<uint8_t>> requests() const;
  void SetHandler(Handler handler);

 private:
  void Serve(int fd);

  std::string cert_pem_;
  std::string key_pem_;
  Mode mode_;
  mutable std::mutex mutex_;
  Handler handler_;
  std::vector<std::vector<uint8_t>> requests_;
  LoopbackServer server_;
};

// Relays TCP connections. kForward passes each connection on to 127.0.0.1:
// target_port, counting them (use it in front of a key server to prove that a
// code path makes no connection). kProxy is an HTTP proxy that honours
// CONNECT to loopback targets only; kRefusingProxy answers every CONNECT with
// "403 Forbidden".
class TcpRelay {
 public:
  enum class Mode { kForward, kProxy, kRefusingProxy };

  explicit TcpRelay(Mode mode, uint16_t target_port = 0);
  uint16_t port() const { return server_.port(); }
  size_t connections() const { return server_.connections(); }
  // The "host:port" of every CONNECT request seen.
  std::vector<std::string> connectTargets() const;

 private:
  void Serve(int fd);

  Mode mode_;
  uint16_t target_port_;
  mutable std::mutex mutex_;
  std::vector<std::string> targets_;
  LoopbackServer server_;
};

// The number of file descriptors this process has open (the entries of
// /proc/self/fd), to show that a code path leaves none behind.
size_t OpenDescriptors();

// A loopback port on which nothing listens (it did a moment ago).
inline uint16_t ClosedPort() {
  return LoopbackServer([](int) {}).port();
}

}  // namespace ZyrdTest
