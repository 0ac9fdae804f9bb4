#include "platform/kmip/ossl.h"

#include <openssl/pem.h>

namespace Qlc {

namespace {

using Kestrel::Common::Ssl::ReadOnlyBio;

int NoPassphrase(char*, int, int, void*) { return 0; }

}  // namespace

std::vector<X509Ptr> ReadPemCertificates(std::string_view pem) {
  std::vector<X509Ptr> certs;
  BioPtr bio = ReadOnlyBio(pem);
  if (!bio) return certs;
  while (X509* cert = PEM_read_bio_X509(bio.get(), nullptr, NoPassphrase, nullptr)) {
    certs.emplace_back(cert);
  }
  // The loop ends with "no start line" after the last certificate; any other
  // error means a damaged certificate, and then none of them is used.
  unsigned long last = ERR_peek_last_error();
  bool clean_end = ERR_GET_LIB(last) == ERR_LIB_PEM && ERR_GET_REASON(last) == PEM_R_NO_START_LINE;
  ERR_clear_error();
  if (!clean_end && last != 0) certs.clear();
  return certs;
}

PkeyPtr ReadPemPrivateKey(std::string_view pem) {
  BioPtr bio = ReadOnlyBio(pem);
  if (!bio) return nullptr;
  PkeyPtr key(PEM_read_bio_PrivateKey(bio.get(), nullptr, NoPassphrase, nullptr));
  ERR_clear_error();
  return key;
}

std::string CertificateToPem(X509* cert) {
  BioPtr bio(BIO_new(BIO_s_mem()));
  if (!bio || PEM_write_bio_X509(bio.get(), cert) != 1) {
    ERR_clear_error();
    return {};
  }
  char* data = nullptr;
  long n = BIO_get_mem_data(bio.get(), &data);
  return n > 0 ? std::string(data, static_cast<size_t>(n)) : std::string();
}

}  // namespace Qlc
