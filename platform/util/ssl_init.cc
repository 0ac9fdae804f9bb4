#include "platform/util/ssl_init.h"

#include <openssl/crypto.h>
#include <openssl/ssl.h>

void SSL_Init(const char*, const char*, const char*) {
  OPENSSL_init_ssl(OPENSSL_INIT_LOAD_SSL_STRINGS | OPENSSL_INIT_LOAD_CRYPTO_STRINGS, nullptr);
}

// OpenSSL 3 frees its global state at exit on its own; the process leaves
// through _exit, so there is nothing to release here.
void SSL_Exit() {}
