#include "platform/kmip/tls_channel.h"

#include <arpa/inet.h>
#include <openssl/x509v3.h>
#include <poll.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

#include "platform/kmip/qlkmipsimple.h"
#include "platform/kmip/ttlv.h"

namespace Qlc {
namespace {

// A socket BIO that sends with MSG_NOSIGNAL, so that a peer closing the
// connection never raises SIGPIPE in the host process.
int SockFd(BIO* b) { return static_cast<int>(reinterpret_cast<intptr_t>(BIO_get_data(b))); }

bool WouldBlock() { return errno == EAGAIN || errno == EWOULDBLOCK || errno == EINTR; }

int SockWrite(BIO* b, const char* data, int len) {
  BIO_clear_retry_flags(b);
  ssize_t n = ::send(SockFd(b), data, static_cast<size_t>(len), MSG_NOSIGNAL);
  if (n < 0 && WouldBlock()) BIO_set_retry_write(b);
  return static_cast<int>(n);
}

int SockRead(BIO* b, char* out, int len) {
  BIO_clear_retry_flags(b);
  ssize_t n = ::recv(SockFd(b), out, static_cast<size_t>(len), 0);
  if (n < 0 && WouldBlock()) BIO_set_retry_read(b);
  return static_cast<int>(n);
}

int SockPuts(BIO* b, const char* text) {
  return SockWrite(b, text, static_cast<int>(strlen(text)));
}

long SockCtrl(BIO*, int cmd, long, void*) { return cmd == BIO_CTRL_FLUSH ? 1 : 0; }

int SockCreate(BIO* b) {
  BIO_set_init(b, 1);
  return 1;
}

const BIO_METHOD* SocketMethod() {
  static BIO_METHOD* method = [] {
    BIO_METHOD* m = BIO_meth_new(BIO_get_new_index() | BIO_TYPE_SOURCE_SINK, "qlc socket");
    BIO_meth_set_write(m, SockWrite);
    BIO_meth_set_read(m, SockRead);
    BIO_meth_set_puts(m, SockPuts);
    BIO_meth_set_ctrl(m, SockCtrl);
    BIO_meth_set_create(m, SockCreate);
    return m;
  }();
  return method;
}

bool IsIpAddress(const std::string& host) {
  unsigned char buf[16];
  return inet_pton(AF_INET, host.c_str(), buf) == 1 || inet_pton(AF_INET6, host.c_str(), buf) == 1;
}

}  // namespace

TlsChannel::TlsChannel(const SessionConfig& config) : config_(config) {}

TlsChannel::~TlsChannel() { Close(); }

Failure TlsChannel::Open(const SessionConfig& config, std::unique_ptr<TlsChannel>* out,
                         std::string* serverCertPem) {
  std::unique_ptr<TlsChannel> channel(new TlsChannel(config));
  if (Failure f = channel->Setup()) return f;
  {
    Deadline deadline(config.timeoutSeconds);
    const Endpoint& first = config.proxy ? *config.proxy : config.server;
    if (Failure f = ConnectTcp(first, deadline, &channel->fd_)) return f;
    if (config.proxy) {
      if (Failure f = ProxyConnect(channel->fd_.get(), config.server, deadline)) return f;
    }
  }
  Failure f = channel->Handshake();
  if (f.number == QLC_E_UNTRUSTED_SERVER) *serverCertPem = channel->peerPem_;
  if (f) return f;
  *out = std::move(channel);
  return {};
}

Failure TlsChannel::Setup() {
  ERR_clear_error();
  ctx_.reset(SSL_CTX_new(TLS_client_method()));
  if (!ctx_ || SSL_CTX_set_min_proto_version(ctx_.get(), TLS1_2_VERSION) != 1) {
    return {QLC_E_RESOURCES, "cannot create a TLS context: " + TakeOpensslErrors()};
  }
  if (!config_.clientCertificate.empty()) {
    std::vector<X509Ptr> chain = ReadPemCertificates(config_.clientCertificate);
    if (chain.empty())
      return {QLC_E_BAD_CERTIFICATE, "the client certificate is not a PEM certificate"};
    PkeyPtr key = ReadPemPrivateKey(config_.clientPrivateKey.view());
    if (!key)
      return {QLC_E_BAD_CERTIFICATE, "the client private key is not an unencrypted PEM key"};
    if (SSL_CTX_use_certificate(ctx_.get(), chain[0].get()) != 1 ||
        SSL_CTX_use_PrivateKey(ctx_.get(), key.get()) != 1 ||
        SSL_CTX_check_private_key(ctx_.get()) != 1) {
      ERR_clear_error();
      return {QLC_E_BAD_CERTIFICATE, "the client private key does not fit the client certificate"};
    }
    for (size_t i = 1; i < chain.size(); ++i) SSL_CTX_add1_chain_cert(ctx_.get(), chain[i].get());
  }
  X509StorePtr store(X509_STORE_new());
  if (!store) return {QLC_E_RESOURCES, "cannot create a certificate store"};
  for (size_t i = 0; i < config_.trustedCertificates.size(); ++i) {
    std::vector<X509Ptr> certs = ReadPemCertificates(config_.trustedCertificates[i]);
    if (certs.empty()) {
      return {QLC_E_BAD_CERTIFICATE,
              "trusted certificate " + std::to_string(i + 1) + " is not a PEM certificate"};
    }
    for (X509Ptr& c : certs) {
      X509_STORE_add_cert(store.get(), c.get());
      trusted_.push_back(std::move(c));
    }
  }
  ERR_clear_error();
  X509_STORE_set_flags(store.get(), X509_V_FLAG_PARTIAL_CHAIN);
  SSL_CTX_set_cert_store(ctx_.get(), store.release());
  SSL_CTX_set_verify(ctx_.get(), SSL_VERIFY_PEER, nullptr);
  SSL_CTX_set_cert_verify_callback(ctx_.get(), VerifyChain, this);
  return {};
}

int TlsChannel::VerifyChain(X509_STORE_CTX* ctx, void* arg) {
  auto* self = static_cast<TlsChannel*>(arg);
  X509* leaf = X509_STORE_CTX_get0_cert(ctx);
  if (leaf != nullptr) self->peerPem_ = CertificateToPem(leaf);
  if (X509_verify_cert(ctx) != 1) {
    self->verifyError_ = X509_verify_cert_error_string(X509_STORE_CTX_get_error(ctx));
    return 0;
  }
  if (!self->LeafIsTrusted(leaf) && !self->HostMatches(leaf)) {
    X509_STORE_CTX_set_error(ctx, X509_V_ERR_HOSTNAME_MISMATCH);
    self->verifyError_ = "the certificate does not name host '" + self->config_.server.host + "'";
    return 0;
  }
  return 1;
}

bool TlsChannel::LeafIsTrusted(X509* leaf) const {
  for (const X509Ptr& t : trusted_) {
    if (X509_cmp(t.get(), leaf) == 0) return true;
  }
  return false;
}

bool TlsChannel::HostMatches(X509* leaf) const {
  const std::string& host = config_.server.host;
  if (IsIpAddress(host)) return X509_check_ip_asc(leaf, host.c_str(), 0) == 1;
  return X509_check_host(leaf, host.data(), host.size(), 0, nullptr) == 1;
}

Failure TlsChannel::SslFailure(int rc, const std::string& during) {
  int err = SSL_get_error(ssl_.get(), rc);
  int saved = errno;
  std::string queue = TakeOpensslErrors();
  if (err == SSL_ERROR_ZERO_RETURN || (err == SSL_ERROR_SYSCALL && saved == 0) ||
      queue.find("unexpected eof") != std::string::npos) {
    return {QLC_E_COMMUNICATION, "the server closed the connection " + during};
  }
  if (err == SSL_ERROR_SYSCALL) return {QLC_E_COMMUNICATION, during + ": " + strerror(saved)};
  return {QLC_E_COMMUNICATION, "TLS failure " + during + (queue.empty() ? "" : ": " + queue)};
}

int TlsChannel::Repeat(const std::function<int()>& op, const Deadline& deadline,
                       const std::string& waiting, Failure* wait) {
  while (true) {
    ERR_clear_error();
    errno = 0;
    int rc = op();
    if (rc == 1) return 1;
    int err = SSL_get_error(ssl_.get(), rc);
    if (err != SSL_ERROR_WANT_READ && err != SSL_ERROR_WANT_WRITE) return rc;
    *wait = WaitReady(fd_.get(), err == SSL_ERROR_WANT_READ ? POLLIN : POLLOUT, deadline, waiting);
    if (*wait) return 0;
  }
}

Failure TlsChannel::Handshake() {
  ssl_.reset(SSL_new(ctx_.get()));
  BIO* bio = ssl_ ? BIO_new(SocketMethod()) : nullptr;
  if (bio == nullptr) return {QLC_E_RESOURCES, "cannot create a TLS connection"};
  BIO_set_data(bio, reinterpret_cast<void*>(static_cast<intptr_t>(fd_.get())));
  SSL_set_bio(ssl_.get(), bio, bio);
  if (!IsIpAddress(config_.server.host)) {
    SSL_set_tlsext_host_name(ssl_.get(), config_.server.host.c_str());
  }
  Failure wait;
  int rc = Repeat([this] { return SSL_connect(ssl_.get()); }, Deadline(config_.timeoutSeconds),
                  "in the TLS handshake", &wait);
  if (rc == 1) return {};
  if (wait) return wait;
  if (!verifyError_.empty()) {
    ERR_clear_error();
    return {QLC_E_UNTRUSTED_SERVER, "the server's certificate is not trusted: " + verifyError_};
  }
  return SslFailure(rc, "in the TLS handshake");
}

Failure TlsChannel::Send(std::span<const uint8_t> data) {
  Deadline deadline(config_.timeoutSeconds);
  while (!data.empty()) {
    size_t written = 0;
    Failure wait;
    int rc = Repeat([&] { return SSL_write_ex(ssl_.get(), data.data(), data.size(), &written); },
                    deadline, "sending the request", &wait);
    if (wait) return wait;
    if (rc != 1) return SslFailure(rc, "while sending the request");
    data = data.subspan(written);
  }
  return {};
}

Failure TlsChannel::ReadExact(uint8_t* out, size_t n, const Deadline& deadline, size_t done_before,
                              size_t total) {
  size_t got = 0;
  while (got < n) {
    size_t read = 0;
    Failure wait;
    int rc = Repeat([&] { return SSL_read_ex(ssl_.get(), out + got, n - got, &read); }, deadline,
                    "waiting for the response", &wait);
    if (wait) return wait;
    if (rc != 1) {
      std::string during = "after " + std::to_string(done_before + got) + " of " +
                           (total ? std::to_string(total) : std::string("at least 8")) +
                           " response bytes";
      return SslFailure(rc, during);
    }
    got += read;
  }
  return {};
}

Failure TlsChannel::Receive(Groundwork::SecureBytes* message) {
  Deadline deadline(config_.timeoutSeconds);
  message->assign(Ttlv::kHeaderSize, 0);
  if (Failure f = ReadExact(message->data(), Ttlv::kHeaderSize, deadline, 0, 0)) return f;
  uint32_t tag = 0, length = 0;
  Ttlv::Type type;
  if (!Ttlv::ReadHeader(*message, &tag, &type, &length) || type != Ttlv::Type::kStructure) {
    return {QLC_E_MALFORMED_RESPONSE, "invalid KMIP response: the message is not a TTLV structure"};
  }
  if (length > Ttlv::kMaxMessageSize - Ttlv::kHeaderSize) {
    return {QLC_E_MALFORMED_RESPONSE, "invalid KMIP response: announced length " +
                                          std::to_string(length) + " exceeds the limit of " +
                                          std::to_string(Ttlv::kMaxMessageSize)};
  }
  message->resize(Ttlv::kHeaderSize + length);
  return ReadExact(message->data() + Ttlv::kHeaderSize, length, deadline, Ttlv::kHeaderSize,
                   Ttlv::kHeaderSize + length);
}

void TlsChannel::Close() {
  if (ssl_ && fd_.get() >= 0) {
    // Best effort on a non-blocking socket: never waits for the peer.
    SSL_shutdown(ssl_.get());
    ERR_clear_error();
  }
  ssl_.reset();
  fd_ = UniqueFd();
}

}  // namespace Qlc
