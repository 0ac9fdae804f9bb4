// Plain TCP for KMIP sessions: name resolution, non-blocking connects bounded
// by a deadline, and the HTTP CONNECT exchange with a proxy. Deadlines are
// kept with poll(2) on non-blocking sockets; no signals are used. Every
// function is thread-safe (no shared state).
#pragma once

#include <netdb.h>

#include <chrono>
#include <string>

#include "platform/kmip/session_description.h"

namespace Qlc {

// A library error number with its explanation; number 0 is success.
struct Failure {
  int number = 0;
  std::string explanation;
  explicit operator bool() const { return number != 0; }
};

// A point in time after which waiting fails with the time-out number.
class Deadline {
 public:
  explicit Deadline(int seconds)
      : at_(std::chrono::steady_clock::now() + std::chrono::seconds(seconds)) {}
  // Milliseconds left (0 when passed), for poll(2).
  int RemainingMs() const;

 private:
  std::chrono::steady_clock::time_point at_;
};

// An owned file descriptor.
class UniqueFd {
 public:
  UniqueFd() = default;
  explicit UniqueFd(int fd) : fd_(fd) {}
  UniqueFd(UniqueFd&& other) noexcept : fd_(other.Release()) {}
  UniqueFd& operator=(UniqueFd&& other) noexcept;
  ~UniqueFd();
  int get() const { return fd_; }
  int Release() {
    int fd = fd_;
    fd_ = -1;
    return fd;
  }

 private:
  int fd_ = -1;
};

// Waits until `fd` is ready for `events` (POLLIN/POLLOUT). Fails with the
// time-out number when the deadline passes; `during` names the step.
Failure WaitReady(int fd, short events, const Deadline& deadline, const std::string& during);

// Resolves `to` and connects a non-blocking socket to the first address
// (IPv4 or IPv6) that accepts, all within the deadline. A host name is
// looked up on a helper thread, because the system resolver cannot be
// interrupted: when the deadline passes first, the call fails with the
// time-out number at once and the lookup finishes (and is discarded) on its
// own. At most kMaxPendingLookups lookups wait at a time; beyond that a
// connect fails at once. Addresses in numeric form need no lookup.
Failure ConnectTcp(const Endpoint& to, const Deadline& deadline, UniqueFd* out);

inline constexpr int kMaxPendingLookups = 64;

// The name lookup ConnectTcp uses, getaddrinfo(3) unless replaced; tests
// put in a slow one. Set it before connecting, not while connects run.
using LookupFunction = int (*)(const char* node, const char* service, const ::addrinfo* hints,
                               ::addrinfo** result);
void SetLookupFunction(LookupFunction lookup);

// Asks the HTTP proxy on `fd` to open a tunnel to `target`; succeeds on a 2xx
// answer. Reads exactly the proxy's answer head, nothing beyond.
Failure ProxyConnect(int fd, const Endpoint& target, const Deadline& deadline);

}  // namespace Qlc
