// A blocking HTTP client over a raw TCP socket, for tests that need to see and
// shape every byte on the wire. Every read gives up after 10 seconds so a
// faulty server fails the test instead of hanging it.
#pragma once

#include <netdb.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>
#include <string>
#include <string_view>

namespace ZyrdTest {

struct RawResponse {
  std::string head;  // status line and headers, up to and including the empty line
  std::string body;  // by Content-Length
};

class RawHttpClient {
 public:
  // Connects to `address` ("127.0.0.1" or "::1") on `port`, at once or, with
  // `connectNow` false, when Connect() is called (the socket exists before).
  explicit RawHttpClient(uint16_t port, const std::string& address = "127.0.0.1",
                         bool connectNow = true) {
    addrinfo hints{};
    hints.ai_flags = AI_NUMERICHOST | AI_NUMERICSERV;
    hints.ai_socktype = SOCK_STREAM;
    if (::getaddrinfo(address.c_str(), std::to_string(port).c_str(), &hints, &address_) != 0 ||
        (fd_ = ::socket(address_->ai_family, SOCK_STREAM, 0)) < 0) {
      throw std::runtime_error("no socket for " + address);
    }
    timeval timeout{10, 0};
    ::setsockopt(fd_, SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout));
    if (connectNow) Connect();
  }
  ~RawHttpClient() {
    if (fd_ >= 0) ::close(fd_);
    ::freeaddrinfo(address_);
  }
  RawHttpClient(const RawHttpClient&) = delete;
  RawHttpClient& operator=(const RawHttpClient&) = delete;

  void Connect() {
    if (::connect(fd_, address_->ai_addr, address_->ai_addrlen) != 0) {
      throw std::runtime_error("connect failed: " + std::to_string(errno));
    }
  }

  // Sends all of `data`; false when the peer stopped taking it.
  bool Send(std::string_view data) {
    while (!data.empty()) {
      ssize_t n = ::send(fd_, data.data(), data.size(), MSG_NOSIGNAL);
      if (n <= 0) return false;
      data.remove_prefix(static_cast<size_t>(n));
    }
    return true;
  }

  // Reads until `n` bytes are buffered (or the peer closes) and takes them.
  std::string ReadExactly(size_t n) {
    Fill([&] { return buffered_.size() >= n; });
    return Take(n);
  }

  // Reads one response: its head, then a body of its Content-Length.
  RawResponse ReadResponse() {
    Fill([&] { return buffered_.find("\r\n\r\n") != std::string::npos; });
    RawResponse r;
    r.head = Take(buffered_.find("\r\n\r\n") + 4);
    const size_t at = r.head.find("Content-Length: ");
    r.body = ReadExactly(at == std::string::npos ? 0 : std::stoul(r.head.substr(at + 16)));
    return r;
  }

  // Everything until the peer closes the connection (or the read times out).
  std::string ReadToEnd() {
    Fill([] { return false; });
    return Take(buffered_.size());
  }

  // Whether the peer has closed cleanly (end of stream, not a reset or a
  // time-out) with nothing more sent.
  bool PeerClosed() { return ReadToEnd().empty() && eof_; }

 private:
  template <typename Done>
  void Fill(Done done) {
    char chunk[16384];
    while (!done() && !eof_) {
      ssize_t n = ::recv(fd_, chunk, sizeof(chunk), 0);
      if (n == 0) eof_ = true;
      if (n <= 0) break;
      buffered_.append(chunk, static_cast<size_t>(n));
    }
  }
  std::string Take(size_t n) {
    std::string out = buffered_.substr(0, n);
    buffered_.erase(0, out.size());
    return out;
  }

  addrinfo* address_ = nullptr;
  int fd_ = -1;
  bool eof_ = false;
  std::string buffered_;
};

}  // namespace ZyrdTest
