#include <openssl/ssl.h>
#include <sys/socket.h>

#include "platform/kmip/ossl.h"
#include "platform/kmip/ttlv.h"
#include "tests/support/kmip_env.h"
#include "tests/support/loopback_server.h"

namespace ZyrdTest {

FakeKmipServer::FakeKmipServer(Handler handler, const std::string& pkiName, Mode mode, bool ipv6)
    : cert_pem_(PkiPem(pkiName)),
      key_pem_(PkiKey(pkiName)),
      mode_(mode),
      handler_(std::move(handler)),
      server_([this](int fd) { Serve(fd); }, ipv6) {}

FakeKmipServer::~FakeKmipServer() { server_.Stop(); }

std::vector<std::vector<uint8_t>> FakeKmipServer::requests() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return requests_;
}

void FakeKmipServer::SetHandler(Handler handler) {
  std::lock_guard<std::mutex> lock(mutex_);
  handler_ = std::move(handler);
}

namespace {

bool ReadExact(SSL* ssl, uint8_t* out, size_t n) {
  size_t got = 0;
  while (got < n) {
    size_t r = 0;
    if (SSL_read_ex(ssl, out + got, n - got, &r) != 1) return false;
    got += r;
  }
  return true;
}

void DiscardUntilClosed(int fd) {
  char buf[4096];
  while (recv(fd, buf, sizeof buf, 0) > 0) {
  }
}

}  // namespace

void FakeKmipServer::Serve(int fd) {
  if (mode_ == Mode::kNoHandshake) return DiscardUntilClosed(fd);
  Qlc::SslCtxPtr ctx(SSL_CTX_new(TLS_server_method()));
  std::vector<Qlc::X509Ptr> certs = Qlc::ReadPemCertificates(cert_pem_);
  Qlc::PkeyPtr key = Qlc::ReadPemPrivateKey(key_pem_);
  if (!ctx || certs.empty() || !key || SSL_CTX_use_certificate(ctx.get(), certs[0].get()) != 1 ||
      SSL_CTX_use_PrivateKey(ctx.get(), key.get()) != 1) {
    return;
  }
  Qlc::SslPtr ssl(SSL_new(ctx.get()));
  SSL_set_fd(ssl.get(), fd);
  if (SSL_accept(ssl.get()) != 1) return;
  while (true) {
    std::vector<uint8_t> request(Qlc::Ttlv::kHeaderSize);
    if (!ReadExact(ssl.get(), request.data(), request.size())) return;
    uint32_t length = (uint32_t{request[4]} << 24) | (uint32_t{request[5]} << 16) |
                      (uint32_t{request[6]} << 8) | request[7];
    if (length > Qlc::Ttlv::kMaxMessageSize) return;
    request.resize(Qlc::Ttlv::kHeaderSize + length);
    if (!ReadExact(ssl.get(), request.data() + Qlc::Ttlv::kHeaderSize, length)) return;
    Handler handler;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      requests_.push_back(request);
      handler = handler_;
    }
    FakeReply reply = handler(request);
    if (reply.silent) return DiscardUntilClosed(fd);
    size_t n = std::min(reply.sendOnly, reply.bytes.size());
    size_t written = 0;
    if (n > 0 && SSL_write_ex(ssl.get(), reply.bytes.data(), n, &written) != 1) return;
    if (reply.close) return;
  }
}

}  // namespace ZyrdTest
