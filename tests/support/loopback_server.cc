#include "tests/support/loopback_server.h"

#include <netdb.h>
#include <netinet/in.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <iterator>
#include <sstream>

namespace ZyrdTest {
namespace {

// A socket for `host` (a loopback name or address) and `port`, bound and
// listening or connected; -1 when that fails.
int LoopbackSocket(const std::string& host, uint16_t port, bool listening) {
  addrinfo hints{};
  hints.ai_socktype = SOCK_STREAM;
  addrinfo* list = nullptr;
  if (getaddrinfo(host.c_str(), std::to_string(port).c_str(), &hints, &list) != 0) return -1;
  int fd = -1;
  for (addrinfo* a = list; a && fd < 0; a = a->ai_next) {
    fd = socket(a->ai_family, SOCK_STREAM | SOCK_CLOEXEC, 0);
    bool ok = listening ? bind(fd, a->ai_addr, a->ai_addrlen) == 0 && listen(fd, 64) == 0
                        : connect(fd, a->ai_addr, a->ai_addrlen) == 0;
    if (fd >= 0 && !ok) {
      close(fd);
      fd = -1;
    }
  }
  freeaddrinfo(list);
  return fd;
}

// Blocking sockets: a send returns when all of it went (or the peer is gone).
bool SendAll(int fd, std::string_view data) {
  return send(fd, data.data(), data.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(data.size());
}

// Copies bytes both ways until either side closes.
void Pump(int a, int b) {
  char buf[16384];
  while (true) {
    pollfd p[2] = {{a, POLLIN, 0}, {b, POLLIN, 0}};
    if (poll(p, 2, -1) < 0) return;
    for (int i = 0; i < 2; ++i) {
      if (!p[i].revents) continue;
      ssize_t n = recv(p[i].fd, buf, sizeof buf, 0);
      if (n <= 0 || !SendAll(p[1 - i].fd, std::string_view(buf, static_cast<size_t>(n)))) return;
    }
  }
}

}  // namespace

LoopbackServer::LoopbackServer(Handler handler, bool ipv6) : handler_(std::move(handler)) {
  listen_fd_ = LoopbackSocket(ipv6 ? "::1" : "127.0.0.1", 0, true);
  sockaddr_in6 bound{};  // sin_port and sin6_port share their place
  socklen_t len = sizeof bound;
  if (listen_fd_ < 0 || getsockname(listen_fd_, reinterpret_cast<sockaddr*>(&bound), &len) != 0) {
    std::abort();
  }
  port_ = ntohs(bound.sin6_port);
  stop_fd_ = eventfd(0, EFD_CLOEXEC);
  acceptor_ = std::thread([this] { AcceptLoop(); });
}

LoopbackServer::~LoopbackServer() { Stop(); }

void LoopbackServer::AcceptLoop() {
  while (true) {
    pollfd p[2] = {{listen_fd_, POLLIN, 0}, {stop_fd_, POLLIN, 0}};
    if (poll(p, 2, -1) < 0) continue;
    if (p[1].revents) return;
    int fd = accept4(listen_fd_, nullptr, nullptr, SOCK_CLOEXEC);
    if (fd < 0) continue;
    std::lock_guard<std::mutex> lock(mutex_);
    ++accepted_;
    open_.insert(fd);
    workers_.emplace_back([this, fd] {
      // SIGPIPE from writing to a closed connection is directed at the
      // writing thread; blocking it here keeps it from killing the test
      // program without hiding it from the code under test.
      sigset_t pipe;
      sigemptyset(&pipe);
      sigaddset(&pipe, SIGPIPE);
      pthread_sigmask(SIG_BLOCK, &pipe, nullptr);
      handler_(fd);
      std::lock_guard<std::mutex> done(mutex_);
      open_.erase(fd);
      close(fd);
    });
  }
}

void LoopbackServer::Stop() {
  if (stopped_.exchange(true)) return;
  uint64_t one = 1;
  (void)!write(stop_fd_, &one, sizeof one);
  acceptor_.join();
  // No new workers start now; a handler blocked in reading returns.
  {
    std::lock_guard<std::mutex> lock(mutex_);
    for (int fd : open_) shutdown(fd, SHUT_RDWR);
  }
  for (std::thread& t : workers_) t.join();
  close(listen_fd_);
  close(stop_fd_);
}

size_t OpenDescriptors() {
  // The iterator's own descriptor is among the entries, on every call alike.
  const std::filesystem::directory_iterator entries("/proc/self/fd");
  return static_cast<size_t>(std::distance(begin(entries), end(entries)));
}

TcpRelay::TcpRelay(Mode mode, uint16_t target_port)
    : mode_(mode), target_port_(target_port), server_([this](int fd) { Serve(fd); }) {}

std::vector<std::string> TcpRelay::connectTargets() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return targets_;
}

void TcpRelay::Serve(int fd) {
  int target = -1;
  if (mode_ == Mode::kForward) {
    target = LoopbackSocket("127.0.0.1", target_port_, false);
  } else {
    std::string head;
    for (char c; head.size() < 8192 && head.find("\r\n\r\n") == std::string::npos;) {
      if (recv(fd, &c, 1, 0) != 1) return;
      head.push_back(c);
    }
    std::string method, authority;  // "CONNECT host:port HTTP/1.1"
    std::istringstream(head) >> method >> authority;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      targets_.push_back(authority);
    }
    const size_t colon = authority.rfind(':');
    std::string host = authority.substr(0, colon);
    if (host.size() > 2 && host.front() == '[') host = host.substr(1, host.size() - 2);
    if (mode_ == Mode::kProxy && method == "CONNECT" && colon != std::string::npos &&
        (host == "127.0.0.1" || host == "localhost" || host == "::1")) {
      target = LoopbackSocket(host, static_cast<uint16_t>(std::atoi(&authority[colon + 1])), false);
    }
    if (!SendAll(fd, target < 0 ? "HTTP/1.1 403 Forbidden\r\nContent-Length: 0\r\n\r\n"
                                : "HTTP/1.1 200 Connection established\r\n\r\n")) {
      if (target >= 0) close(target);
      return;
    }
  }
  if (target >= 0) {
    Pump(fd, target);
    close(target);
  }
}

}  // namespace ZyrdTest
