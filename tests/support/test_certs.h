// Throwaway keys and self-signed certificates made with OpenSSL, for tests.
#pragma once

#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>

#include <stdexcept>
#include <string>

#include "platform/ssl/openssl_ptr.h"

namespace ZyrdTest {

struct TestCert {
  std::string certificatePem;  // as PEM_write_bio_X509 writes it
  std::string privateKeyPem;   // PKCS#8
  std::string publicKeyPem;    // SubjectPublicKeyInfo
};

inline TestCert MakeSelfSignedCert(const std::string& commonName) {
  namespace Ssl = Kestrel::Common::Ssl;
  Ssl::EvpPkeyPtr key(EVP_RSA_gen(2048));
  Ssl::X509Ptr cert(X509_new());
  if (!key || !cert) throw std::runtime_error("cannot make a test key");
  X509_set_version(cert.get(), 2);
  ASN1_INTEGER_set(X509_get_serialNumber(cert.get()), 1);
  X509_gmtime_adj(X509_getm_notBefore(cert.get()), 0);
  X509_gmtime_adj(X509_getm_notAfter(cert.get()), 86400);
  X509_set_pubkey(cert.get(), key.get());
  X509_NAME* name = X509_get_subject_name(cert.get());
  X509_NAME_add_entry_by_txt(name, "CN", MBSTRING_ASC,
                             reinterpret_cast<const unsigned char*>(commonName.c_str()), -1, -1, 0);
  X509_set_issuer_name(cert.get(), name);
  if (X509_sign(cert.get(), key.get(), EVP_sha256()) == 0) {
    throw std::runtime_error("cannot sign a test certificate");
  }
  TestCert out;
  Ssl::BioPtr bio(BIO_new(BIO_s_mem()));
  PEM_write_bio_X509(bio.get(), cert.get());
  out.certificatePem = Ssl::BioText(bio.get());
  bio.reset(BIO_new(BIO_s_mem()));
  PEM_write_bio_PrivateKey(bio.get(), key.get(), nullptr, nullptr, 0, nullptr, nullptr);
  out.privateKeyPem = Ssl::BioText(bio.get());
  bio.reset(BIO_new(BIO_s_mem()));
  PEM_write_bio_PUBKEY(bio.get(), key.get());
  out.publicKeyPem = Ssl::BioText(bio.get());
  return out;
}

}  // namespace ZyrdTest
