// Process-wide OpenSSL set-up and tear-down.
#pragma once

// Initialises libssl and libcrypto. The three arguments exist for callers that
// pass a library path, a default configuration and a FIPS switch; they are
// accepted and ignored (OpenSSL 3 loads its configuration itself).
void SSL_Init(const char* libDir, const char* defaultLib, const char* fipsConfig);
// Releases what SSL_Init set up. Safe to call when nothing was initialised.
void SSL_Exit();
