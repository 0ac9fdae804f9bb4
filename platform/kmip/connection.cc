#include "platform/kmip/connection.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <cstring>
#include <memory>
#include <mutex>
#include <thread>

#include "platform/kmip/qlkmipsimple.h"

namespace Qlc {

int Deadline::RemainingMs() const {
  auto left =
      std::chrono::duration_cast<std::chrono::milliseconds>(at_ - std::chrono::steady_clock::now());
  return left.count() <= 0 ? 0 : static_cast<int>(left.count());
}

UniqueFd& UniqueFd::operator=(UniqueFd&& other) noexcept {
  if (this != &other) {
    if (fd_ >= 0) ::close(fd_);
    fd_ = other.Release();
  }
  return *this;
}

UniqueFd::~UniqueFd() {
  if (fd_ >= 0) ::close(fd_);
}

Failure WaitReady(int fd, short events, const Deadline& deadline, const std::string& during) {
  while (true) {
    pollfd p{fd, events, 0};
    int ms = deadline.RemainingMs();
    int n = ms == 0 ? 0 : ::poll(&p, 1, ms);
    if (n > 0) return {};
    if (n == 0) return {QLC_E_TIMEOUT, "timed out " + during};
    if (errno != EINTR) return {QLC_E_COMMUNICATION, during + ": poll failed: " + strerror(errno)};
  }
}

namespace {

std::string HostPort(const Endpoint& e) {
  bool v6 = e.host.find(':') != std::string::npos;
  return (v6 ? "[" + e.host + "]" : e.host) + ":" + std::to_string(e.port);
}

struct AddrInfoFree {
  void operator()(addrinfo* a) const { freeaddrinfo(a); }
};

using AddrInfoPtr = std::unique_ptr<addrinfo, AddrInfoFree>;

std::atomic<LookupFunction> gLookup{&::getaddrinfo};
std::atomic<int> gPendingLookups{0};

// One lookup on a helper thread; whoever comes last (the lookup, or a caller
// that gave up waiting) frees what the other left.
struct Lookup {
  std::mutex mutex;
  std::condition_variable done;
  bool finished = false;
  bool abandoned = false;
  int rc = 0;
  addrinfo* found = nullptr;
};

Failure Resolve(const Endpoint& to, const Deadline& deadline, AddrInfoPtr& out) {
  addrinfo hints{};
  hints.ai_family = AF_UNSPEC;
  hints.ai_socktype = SOCK_STREAM;
  hints.ai_protocol = IPPROTO_TCP;
  const std::string port = std::to_string(to.port);
  addrinfo* found = nullptr;
  hints.ai_flags = AI_NUMERICHOST;
  if (::getaddrinfo(to.host.c_str(), port.c_str(), &hints, &found) == 0) {
    out.reset(found);
    return {};
  }
  hints.ai_flags = 0;
  if (gPendingLookups.fetch_add(1) >= kMaxPendingLookups) {
    --gPendingLookups;
    return {QLC_E_COMMUNICATION, "cannot resolve '" + to.host + "': too many lookups pending"};
  }
  auto lookup = std::make_shared<Lookup>();
  std::thread([lookup, host = to.host, port, hints, fn = gLookup.load()] {
    addrinfo* result = nullptr;
    const int rc = fn(host.c_str(), port.c_str(), &hints, &result);
    {
      std::lock_guard<std::mutex> lock(lookup->mutex);
      if (lookup->abandoned) {
        if (rc == 0) freeaddrinfo(result);
      } else {
        lookup->rc = rc;
        lookup->found = rc == 0 ? result : nullptr;
        lookup->finished = true;
      }
    }
    lookup->done.notify_all();
    --gPendingLookups;
  }).detach();

  std::unique_lock<std::mutex> lock(lookup->mutex);
  if (!lookup->done.wait_for(lock, std::chrono::milliseconds(deadline.RemainingMs()),
                             [&] { return lookup->finished; })) {
    lookup->abandoned = true;
    return {QLC_E_TIMEOUT, "timed out resolving '" + to.host + "'"};
  }
  if (lookup->rc != 0) {
    return {QLC_E_COMMUNICATION, "cannot resolve '" + to.host + "': " + gai_strerror(lookup->rc)};
  }
  out.reset(lookup->found);
  return {};
}

}  // namespace

void SetLookupFunction(LookupFunction lookup) { gLookup.store(lookup ? lookup : &::getaddrinfo); }

Failure ConnectTcp(const Endpoint& to, const Deadline& deadline, UniqueFd* out) {
  AddrInfoPtr list;
  if (Failure f = Resolve(to, deadline, list)) return f;
  Failure last{QLC_E_COMMUNICATION, "no address for '" + to.host + "'"};
  for (addrinfo* a = list.get(); a != nullptr; a = a->ai_next) {
    UniqueFd fd(
        ::socket(a->ai_family, a->ai_socktype | SOCK_NONBLOCK | SOCK_CLOEXEC, a->ai_protocol));
    if (fd.get() < 0) {
      last = {QLC_E_COMMUNICATION, std::string("cannot create a socket: ") + strerror(errno)};
      continue;
    }
    if (::connect(fd.get(), a->ai_addr, a->ai_addrlen) != 0) {
      if (errno != EINPROGRESS) {
        last = {QLC_E_COMMUNICATION, "cannot connect to " + HostPort(to) + ": " + strerror(errno)};
        continue;
      }
      Failure wait = WaitReady(fd.get(), POLLOUT, deadline, "connecting to " + HostPort(to));
      if (wait) return wait;
      int err = 0;
      socklen_t len = sizeof err;
      if (getsockopt(fd.get(), SOL_SOCKET, SO_ERROR, &err, &len) != 0) err = errno;
      if (err != 0) {
        last = {QLC_E_COMMUNICATION, "cannot connect to " + HostPort(to) + ": " + strerror(err)};
        continue;
      }
    }
    *out = std::move(fd);
    return {};
  }
  return last;
}

namespace {

Failure SendAll(int fd, std::string_view data, const Deadline& deadline,
                const std::string& during) {
  while (!data.empty()) {
    ssize_t n = ::send(fd, data.data(), data.size(), MSG_NOSIGNAL);
    if (n > 0) {
      data.remove_prefix(static_cast<size_t>(n));
      continue;
    }
    if (n < 0 && (errno == EAGAIN || errno == EWOULDBLOCK || errno == EINTR)) {
      if (Failure f = WaitReady(fd, POLLOUT, deadline, during)) return f;
      continue;
    }
    return {QLC_E_COMMUNICATION, during + ": " + strerror(errno)};
  }
  return {};
}

}  // namespace

Failure ProxyConnect(int fd, const Endpoint& target, const Deadline& deadline) {
  std::string authority = HostPort(target);
  std::string request = "CONNECT " + authority + " HTTP/1.1\r\nHost: " + authority + "\r\n\r\n";
  const std::string during = "talking to the proxy";
  if (Failure f = SendAll(fd, request, deadline, during)) return f;

  // One byte at a time, so that nothing of the tunnelled stream is consumed.
  constexpr size_t kMaxHead = 8192;
  std::string head;
  while (head.size() < 4 || head.compare(head.size() - 4, 4, "\r\n\r\n") != 0) {
    if (head.size() == kMaxHead) return {QLC_E_COMMUNICATION, "the proxy's answer is too long"};
    char c;
    ssize_t n = ::recv(fd, &c, 1, 0);
    if (n == 1) {
      head.push_back(c);
      continue;
    }
    if (n == 0) return {QLC_E_COMMUNICATION, "the proxy closed the connection before answering"};
    if (errno == EAGAIN || errno == EWOULDBLOCK || errno == EINTR) {
      if (Failure f = WaitReady(fd, POLLIN, deadline, during)) return f;
      continue;
    }
    return {QLC_E_COMMUNICATION, during + ": " + strerror(errno)};
  }
  // "HTTP/1.x NNN reason"
  std::string status_line = head.substr(0, head.find("\r\n"));
  int code = 0;
  if (status_line.size() < 12 || status_line.compare(0, 7, "HTTP/1.") != 0 ||
      std::sscanf(status_line.c_str() + 8, " %3d", &code) != 1) {
    return {QLC_E_COMMUNICATION, "the proxy did not answer with HTTP"};
  }
  if (code < 200 || code > 299) {
    std::string shown;
    for (char c : status_line.substr(0, 80)) shown.push_back(c >= 0x20 && c < 0x7f ? c : '?');
    return {QLC_E_COMMUNICATION, "the proxy refused the tunnel to " + authority + ": " + shown};
  }
  return {};
}

}  // namespace Qlc
