// One TLS connection to a KMIP server, opened as a session description says
// (optionally through an HTTP proxy) and carrying whole TTLV messages.
// Not thread-safe: one channel belongs to one session at a time.
#pragma once

#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "platform/kmip/connection.h"
#include "platform/kmip/ossl.h"
#include "platform/kmip/session_description.h"
#include "platform/util/secure_buffer.h"

namespace Qlc {

class TlsChannel {
 public:
  // Connects and completes the handshake. On failure with the untrusted
  // number, `serverCertPem` receives the certificate the server presented.
  static Failure Open(const SessionConfig& config, std::unique_ptr<TlsChannel>* out,
                      std::string* serverCertPem);

  ~TlsChannel();
  TlsChannel(const TlsChannel&) = delete;
  TlsChannel& operator=(const TlsChannel&) = delete;

  // Sends all of `data` within the time-out.
  Failure Send(std::span<const uint8_t> data);
  // Receives one whole TTLV message (header and value) within the time-out.
  // A header announcing more than the size cap fails as malformed.
  Failure Receive(Groundwork::SecureBytes* message);
  // Sends the TLS close notification without waiting, then closes.
  void Close();

 private:
  explicit TlsChannel(const SessionConfig& config);
  Failure Setup();
  Failure Handshake();
  // Repeats `op` (an SSL call that returns 1 on success) while OpenSSL asks
  // to wait for the socket. Returns 1, the failing return value, or 0 with
  // `wait` set when the deadline passed while waiting.
  int Repeat(const std::function<int()>& op, const Deadline& deadline, const std::string& waiting,
             Failure* wait);
  Failure ReadExact(uint8_t* out, size_t n, const Deadline& deadline, size_t done_before,
                    size_t total);
  Failure SslFailure(int rc, const std::string& during);
  bool LeafIsTrusted(X509* leaf) const;
  bool HostMatches(X509* leaf) const;
  static int VerifyChain(X509_STORE_CTX* ctx, void* arg);

  const SessionConfig& config_;
  UniqueFd fd_;
  SslCtxPtr ctx_;
  SslPtr ssl_;
  std::vector<X509Ptr> trusted_;
  std::string peerPem_;      // the server's leaf, captured during verification
  std::string verifyError_;  // why the server was not trusted
};

}  // namespace Qlc
