// Owning pointers for the OpenSSL objects the KMIP library uses, and the
// conversion of OpenSSL's error queue into a reason text.
#pragma once

#include <openssl/bio.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/ssl.h>
#include <openssl/x509.h>

#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace Qlc {

template <typename T, void (*Free)(T*)>
struct OsslDeleter {
  void operator()(T* p) const { Free(p); }
};

using BioPtr = std::unique_ptr<BIO, OsslDeleter<BIO, BIO_free_all>>;
using X509Ptr = std::unique_ptr<X509, OsslDeleter<X509, X509_free>>;
using PkeyPtr = std::unique_ptr<EVP_PKEY, OsslDeleter<EVP_PKEY, EVP_PKEY_free>>;
using SslCtxPtr = std::unique_ptr<SSL_CTX, OsslDeleter<SSL_CTX, SSL_CTX_free>>;
using SslPtr = std::unique_ptr<SSL, OsslDeleter<SSL, SSL_free>>;
using X509StorePtr = std::unique_ptr<X509_STORE, OsslDeleter<X509_STORE, X509_STORE_free>>;

// Empties the calling thread's OpenSSL error queue and returns its entries
// as one text ("" when empty), most recent last.
std::string TakeOpensslErrors();

// Reads every certificate of a PEM text (one or a bundle). Empty when the text
// holds none or any of them is damaged.
std::vector<X509Ptr> ReadPemCertificates(std::string_view pem);

// Reads an unencrypted private key from PEM text; null when there is none.
// Never prompts for a passphrase.
PkeyPtr ReadPemPrivateKey(std::string_view pem);

// The PEM text of a certificate ("" on failure).
std::string CertificateToPem(X509* cert);

}  // namespace Qlc
