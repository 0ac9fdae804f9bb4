// Owning handles for OpenSSL objects, one std::unique_ptr alias per type with
// the type's own free function as deleter, and the error-queue reader that
// turns OpenSSL failures into a reason text at the boundary.
//
// Every SSL utility of the daemon holds OpenSSL objects only through these
// handles, so no object leaks on an early return.
#pragma once

#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/ssl.h>
#include <openssl/x509.h>
#include <openssl/x509_vfy.h>

#include <memory>
#include <string>
#include <string_view>

namespace Kestrel::Common::Ssl {

template <auto Free>
struct Deleter {
  template <typename T>
  void operator()(T* p) const noexcept {
    Free(p);
  }
};

using Asn1TimePtr = std::unique_ptr<ASN1_TIME, Deleter<ASN1_TIME_free>>;
using BioPtr = std::unique_ptr<BIO, Deleter<BIO_free_all>>;
using BignumPtr = std::unique_ptr<BIGNUM, Deleter<BN_free>>;
using EvpCipherCtxPtr = std::unique_ptr<EVP_CIPHER_CTX, Deleter<EVP_CIPHER_CTX_free>>;
using EvpMdCtxPtr = std::unique_ptr<EVP_MD_CTX, Deleter<EVP_MD_CTX_free>>;
using EvpMdPtr = std::unique_ptr<EVP_MD, Deleter<EVP_MD_free>>;
using EvpPkeyCtxPtr = std::unique_ptr<EVP_PKEY_CTX, Deleter<EVP_PKEY_CTX_free>>;
using EvpPkeyPtr = std::unique_ptr<EVP_PKEY, Deleter<EVP_PKEY_free>>;
using SslCtxPtr = std::unique_ptr<SSL_CTX, Deleter<SSL_CTX_free>>;
using SslPtr = std::unique_ptr<SSL, Deleter<SSL_free>>;
using X509NamePtr = std::unique_ptr<X509_NAME, Deleter<X509_NAME_free>>;
using X509Ptr = std::unique_ptr<X509, Deleter<X509_free>>;
using X509ReqPtr = std::unique_ptr<X509_REQ, Deleter<X509_REQ_free>>;
using X509StoreCtxPtr = std::unique_ptr<X509_STORE_CTX, Deleter<X509_STORE_CTX_free>>;
using X509StorePtr = std::unique_ptr<X509_STORE, Deleter<X509_STORE_free>>;

// A read-only memory BIO over `data`, which must outlive the BIO. Null when
// OpenSSL cannot allocate it.
inline BioPtr ReadOnlyBio(std::string_view data) {
  return BioPtr(BIO_new_mem_buf(data.data(), static_cast<int>(data.size())));
}

// The contents of a memory BIO as a string.
inline std::string BioText(BIO* bio) {
  char* data = nullptr;
  long size = BIO_get_mem_data(bio, &data);
  return size > 0 ? std::string(data, static_cast<size_t>(size)) : std::string();
}

// Empties the calling thread's OpenSSL error queue and returns its entries,
// oldest first, joined by "; " (`fallback` when the queue was empty).
inline std::string TakeErrorText(std::string_view fallback = "unknown OpenSSL error") {
  std::string text;
  char buf[256];
  while (unsigned long code = ERR_get_error()) {
    ERR_error_string_n(code, buf, sizeof buf);
    if (!text.empty()) text += "; ";
    text += buf;
  }
  return text.empty() ? std::string(fallback) : text;
}

}  // namespace Kestrel::Common::Ssl
