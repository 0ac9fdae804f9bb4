#include "tests/support/loopback_server.h"

#include <arpa/inet.h>
#include <netdb.h>
#include <netinet/in.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>

namespace ZyrdTest {

LoopbackServer::LoopbackServer(Handler handler, bool ipv6) : handler_(std::move(handler)) {
  listen_fd_ = socket(ipv6 ? AF_INET6 : AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  int one = 1;
  setsockopt(listen_fd_, SOL_SOCKET, SO_REUSEADDR, &one, sizeof one);
  sockaddr_storage s{};
  socklen_t len = sizeof s;
  if (ipv6) {
    auto* a = reinterpret_cast<sockaddr_in6*>(&s);
    a->sin6_family = AF_INET6;
    a->sin6_addr = in6addr_loopback;
    len = sizeof *a;
  } else {
    auto* a = reinterpret_cast<sockaddr_in*>(&s);
    a->sin_family = AF_INET;
    a->sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    len = sizeof *a;
  }
  if (bind(listen_fd_, reinterpret_cast<sockaddr*>(&s), len) != 0 || listen(listen_fd_, 64) != 0 ||
      getsockname(listen_fd_, reinterpret_cast<sockaddr*>(&s), &len) != 0) {
    std::abort();
  }
  port_ = ntohs(ipv6 ? reinterpret_cast<sockaddr_in6*>(&s)->sin6_port
                     : reinterpret_cast<sockaddr_in*>(&s)->sin_port);
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
    if (stopped_) {
      close(fd);
      return;
    }
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
  {
    std::lock_guard<std::mutex> lock(mutex_);
    if (stopped_) return;
    stopped_ = true;
    for (int fd : open_) shutdown(fd, SHUT_RDWR);
  }
  uint64_t one = 1;
  (void)!write(stop_fd_, &one, sizeof one);
  acceptor_.join();
  // No new workers can start now; shut down any that began meanwhile.
  {
    std::lock_guard<std::mutex> lock(mutex_);
    for (int fd : open_) shutdown(fd, SHUT_RDWR);
  }
  for (std::thread& t : workers_) t.join();
  close(listen_fd_);
  close(stop_fd_);
}

TcpRelay::TcpRelay(Mode mode, uint16_t target_port)
    : mode_(mode), target_port_(target_port), server_([this](int fd) { Serve(fd); }) {}

std::vector<std::string> TcpRelay::connectTargets() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return targets_;
}

namespace {

bool WriteAll(int fd, const void* data, size_t n) {
  const char* p = static_cast<const char*>(data);
  while (n > 0) {
    ssize_t w = send(fd, p, n, MSG_NOSIGNAL);
    if (w <= 0) return false;
    p += w;
    n -= static_cast<size_t>(w);
  }
  return true;
}

int ConnectLoopback(const std::string& host, uint16_t port) {
  addrinfo hints{};
  hints.ai_socktype = SOCK_STREAM;
  addrinfo* list = nullptr;
  if (getaddrinfo(host.c_str(), std::to_string(port).c_str(), &hints, &list) != 0) return -1;
  int fd = -1;
  for (addrinfo* a = list; a && fd < 0; a = a->ai_next) {
    fd = socket(a->ai_family, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd >= 0 && connect(fd, a->ai_addr, a->ai_addrlen) != 0) {
      close(fd);
      fd = -1;
    }
  }
  freeaddrinfo(list);
  return fd;
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
      if (n <= 0 || !WriteAll(p[1 - i].fd, buf, static_cast<size_t>(n))) return;
    }
  }
}

}  // namespace

void TcpRelay::Serve(int fd) {
  if (mode_ == Mode::kForward) {
    int target = ConnectLoopback("127.0.0.1", target_port_);
    if (target < 0) return;
    Pump(fd, target);
    close(target);
    return;
  }
  std::string head;
  char c;
  while (head.size() < 8192 && (head.size() < 4 || head.compare(head.size() - 4, 4, "\r\n\r\n"))) {
    if (recv(fd, &c, 1, 0) != 1) return;
    head.push_back(c);
  }
  // "CONNECT host:port HTTP/1.1"
  std::string line = head.substr(0, head.find("\r\n"));
  size_t sp1 = line.find(' '), sp2 = line.rfind(' ');
  std::string authority =
      sp1 != std::string::npos && sp2 > sp1 ? line.substr(sp1 + 1, sp2 - sp1 - 1) : "";
  {
    std::lock_guard<std::mutex> lock(mutex_);
    targets_.push_back(authority);
  }
  size_t colon = authority.rfind(':');
  std::string host = colon == std::string::npos ? "" : authority.substr(0, colon);
  if (host.size() > 2 && host.front() == '[') host = host.substr(1, host.size() - 2);
  bool loopback = host == "127.0.0.1" || host == "localhost" || host == "::1";
  int target = -1;
  if (mode_ == Mode::kProxy && line.compare(0, 8, "CONNECT ") == 0 && loopback) {
    target = ConnectLoopback(host, static_cast<uint16_t>(std::atoi(authority.c_str() + colon + 1)));
  }
  if (target < 0) {
    const char* refusal = "HTTP/1.1 403 Forbidden\r\nContent-Length: 0\r\n\r\n";
    WriteAll(fd, refusal, strlen(refusal));
    return;
  }
  const char* ok = "HTTP/1.1 200 Connection established\r\n\r\n";
  if (WriteAll(fd, ok, strlen(ok))) Pump(fd, target);
  close(target);
}

}  // namespace ZyrdTest
