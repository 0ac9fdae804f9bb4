// SslUtils: keys, certificates and signing requests.
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/x509v3.h>
#include <unistd.h>

#include <climits>
#include <utility>
#include <vector>

#include "platform/ssl/openssl_ptr.h"
#include "platform/ssl/ssl_utils.h"

namespace Kestrel::Common::SslUtils {
namespace {

using Ssl::BioPtr;
using Ssl::EvpPkeyPtr;
using Ssl::X509Ptr;
using Ssl::X509ReqPtr;

constexpr int kRsaBits = 2048;
constexpr int kSerialBits = 128;
constexpr long kValidityDays = 3650;
constexpr long kSecondsPerDay = 86400;

struct FreeExtensions {
  void operator()(STACK_OF(X509_EXTENSION) * s) const {
    sk_X509_EXTENSION_pop_free(s, X509_EXTENSION_free);
  }
};
using ExtensionStack = std::unique_ptr<STACK_OF(X509_EXTENSION), FreeExtensions>;

// Returns `ok`, clearing OpenSSL's error queue when it is false.
bool Done(bool ok) {
  if (!ok) ERR_clear_error();
  return ok;
}

std::string HostName() {
  char name[HOST_NAME_MAX + 1] = {};
  if (gethostname(name, sizeof name - 1) != 0 || name[0] == '\0') return "localhost";
  return name;
}

X509Ptr ReadCert(std::string_view pem) {
  BioPtr in = Ssl::ReadOnlyBio(pem);
  return X509Ptr(in ? PEM_read_bio_X509(in.get(), nullptr, nullptr, nullptr) : nullptr);
}

// Reads a private key without ever prompting for a passphrase.
EvpPkeyPtr ReadKey(std::string_view pem) {
  BioPtr in = Ssl::ReadOnlyBio(pem);
  return EvpPkeyPtr(in ? PEM_read_bio_PrivateKey(in.get(), nullptr, nullptr, const_cast<char*>(""))
                       : nullptr);
}

X509ReqPtr ReadCsr(std::string_view pem) {
  BioPtr in = Ssl::ReadOnlyBio(pem);
  return X509ReqPtr(in ? PEM_read_bio_X509_REQ(in.get(), nullptr, nullptr, nullptr) : nullptr);
}

// The key as PKCS#8 PEM through a memory BIO that clears its buffer when freed.
bool WriteKey(EVP_PKEY* key, Groundwork::SecureString& pem) {
  BioPtr out(BIO_new(BIO_s_secmem()));
  if (!out ||
      PEM_write_bio_PrivateKey(out.get(), key, nullptr, nullptr, 0, nullptr, nullptr) != 1) {
    return false;
  }
  char* data = nullptr;
  long size = BIO_get_mem_data(out.get(), &data);
  if (size <= 0) return false;
  pem.assign(std::string_view(data, static_cast<size_t>(size)));
  return true;
}

bool SetSubjectCommonName(X509_NAME* name) {
  const std::string host = HostName();
  return X509_NAME_add_entry_by_txt(name, "CN", MBSTRING_UTF8,
                                    reinterpret_cast<const unsigned char*>(host.c_str()), -1, -1,
                                    0) == 1;
}

// Adds the extensions (name, value as in an OpenSSL configuration) to `cert`.
bool AddExtensions(X509* cert, const std::vector<std::pair<int, const char*>>& extensions) {
  X509V3_CTX ctx;
  X509V3_set_ctx_nodb(&ctx);
  X509V3_set_ctx(&ctx, cert, cert, nullptr, nullptr, 0);
  for (const auto& [nid, value] : extensions) {
    X509_EXTENSION* ext = X509V3_EXT_conf_nid(nullptr, &ctx, nid, value);
    bool added = ext != nullptr && X509_add_ext(cert, ext, -1) == 1;
    X509_EXTENSION_free(ext);
    if (!added) return false;
  }
  return true;
}

bool RandomSerial(X509* cert) {
  Ssl::BignumPtr serial(BN_new());
  if (!serial || BN_rand(serial.get(), kSerialBits, BN_RAND_TOP_ANY, BN_RAND_BOTTOM_ANY) != 1) {
    return false;
  }
  ASN1_INTEGER* integer = BN_to_ASN1_INTEGER(serial.get(), X509_get_serialNumber(cert));
  return integer != nullptr;
}

bool WritePem(int (*write)(BIO*, void*), void* object, std::string& pem) {
  BioPtr out(BIO_new(BIO_s_mem()));
  if (!out || write(out.get(), object) != 1) return false;
  pem = Ssl::BioText(out.get());
  return !pem.empty();
}

}  // namespace

bool GenerateKeyAndCert(Groundwork::SecureString& privateKeyPem, std::string& certPem) {
  EvpPkeyPtr key(EVP_RSA_gen(kRsaBits));
  X509Ptr cert(X509_new());
  bool ok =
      key && cert && X509_set_version(cert.get(), X509_VERSION_3) == 1 &&
      RandomSerial(cert.get()) && X509_gmtime_adj(X509_getm_notBefore(cert.get()), 0) != nullptr &&
      X509_time_adj_ex(X509_getm_notAfter(cert.get()), kValidityDays, 0, nullptr) != nullptr &&
      SetSubjectCommonName(X509_get_subject_name(cert.get())) &&
      X509_set_issuer_name(cert.get(), X509_get_subject_name(cert.get())) == 1 &&
      X509_set_pubkey(cert.get(), key.get()) == 1 &&
      AddExtensions(cert.get(), {{NID_basic_constraints, "critical,CA:FALSE"},
                                 {NID_key_usage, "critical,digitalSignature,keyEncipherment"},
                                 {NID_ext_key_usage, "clientAuth"},
                                 {NID_subject_key_identifier, "hash"}}) &&
      X509_sign(cert.get(), key.get(), EVP_sha256()) > 0;
  Groundwork::SecureString keyPem;
  std::string text;
  ok = ok && WriteKey(key.get(), keyPem) &&
       WritePem([](BIO* b, void* x) { return PEM_write_bio_X509(b, static_cast<X509*>(x)); },
                cert.get(), text);
  if (!Done(ok)) return false;
  privateKeyPem = std::move(keyPem);
  certPem = std::move(text);
  return true;
}

bool GenerateKeyAndCsr(Groundwork::SecureString& privateKeyPem, std::string& csrPem) {
  EvpPkeyPtr key(EVP_RSA_gen(kRsaBits));
  X509ReqPtr req(X509_REQ_new());
  ExtensionStack extensions(sk_X509_EXTENSION_new_null());
  X509_EXTENSION* clientAuth =
      X509V3_EXT_conf_nid(nullptr, nullptr, NID_ext_key_usage, "clientAuth");
  bool ok = key && req && extensions && clientAuth != nullptr &&
            sk_X509_EXTENSION_push(extensions.get(), clientAuth) > 0;
  if (!ok) X509_EXTENSION_free(clientAuth);  // not owned by the stack
  ok = ok && X509_REQ_set_version(req.get(), X509_REQ_VERSION_1) == 1 &&
       SetSubjectCommonName(X509_REQ_get_subject_name(req.get())) &&
       X509_REQ_set_pubkey(req.get(), key.get()) == 1 &&
       X509_REQ_add_extensions(req.get(), extensions.get()) == 1 &&
       X509_REQ_sign(req.get(), key.get(), EVP_sha256()) > 0;
  Groundwork::SecureString keyPem;
  std::string text;
  ok =
      ok && WriteKey(key.get(), keyPem) &&
      WritePem([](BIO* b, void* x) { return PEM_write_bio_X509_REQ(b, static_cast<X509_REQ*>(x)); },
               req.get(), text);
  if (!Done(ok)) return false;
  privateKeyPem = std::move(keyPem);
  csrPem = std::move(text);
  return true;
}

bool StandardizePemCsr(std::string& pem) {
  static constexpr std::string_view kNewHeader = "-----BEGIN NEW CERTIFICATE REQUEST-----";
  static constexpr std::string_view kNewFooter = "-----END NEW CERTIFICATE REQUEST-----";
  const std::string footer = std::string(kCsrFooter) + "\n";
  if (StandardizePemString(kCsrHeader, footer, pem)) return true;
  std::string copy = pem;
  if (!StandardizePemString(kNewHeader, std::string(kNewFooter) + "\n", copy)) return false;
  // Same payload lines, standard markers.
  const size_t payload = kNewHeader.size() + 1;
  const size_t payloadEnd = copy.size() - kNewFooter.size() - 1;
  pem = std::string(kCsrHeader) + "\n" + copy.substr(payload, payloadEnd - payload) + footer;
  return true;
}

bool ValidatePemCert(std::string_view certPem) { return Done(ReadCert(certPem) != nullptr); }

bool ValidatePemCertWithKey(std::string_view certPem, std::string_view keyPem) {
  X509Ptr cert = ReadCert(certPem);
  EvpPkeyPtr key = cert ? ReadKey(keyPem) : nullptr;
  return Done(key && X509_check_private_key(cert.get(), key.get()) == 1);
}

bool ValidatePemCsrWithKey(std::string_view csrPem, std::string_view keyPem) {
  X509ReqPtr req = ReadCsr(csrPem);
  EvpPkeyPtr key = req ? ReadKey(keyPem) : nullptr;
  return Done(key && X509_REQ_verify(req.get(), key.get()) == 1 &&
              X509_REQ_check_private_key(req.get(), key.get()) == 1);
}

bool ComparePemCerts(std::string_view a, std::string_view b) {
  X509Ptr first = ReadCert(a);
  X509Ptr second = first ? ReadCert(b) : nullptr;
  return Done(second && X509_cmp(first.get(), second.get()) == 0);
}

bool GetPemCertDaysToExpire(std::string_view certPem, int64_t& days, std::time_t now) {
  X509Ptr cert = ReadCert(certPem);
  Ssl::Asn1TimePtr from(cert ? ASN1_TIME_set(nullptr, now) : nullptr);
  int wholeDays = 0;
  int seconds = 0;
  if (!Done(from && ASN1_TIME_diff(&wholeDays, &seconds, from.get(),
                                   X509_get0_notAfter(cert.get())) == 1)) {
    return false;
  }
  const int64_t total = int64_t{wholeDays} * kSecondsPerDay + seconds;
  days = total >= 0 ? total / kSecondsPerDay : -((-total + kSecondsPerDay - 1) / kSecondsPerDay);
  return true;
}

}  // namespace Kestrel::Common::SslUtils
