// Attestation tokens for tests and benchmarks: an RSA key pair made once per
// process and JWTs signed with it (or with anything else a test needs).
#pragma once

#include <jwt.h>

#include <cstdlib>
#include <string>

#include "tests/support/test_certs.h"

namespace ZyrdTest {

struct KeyPair {
  std::string privatePem;
  std::string publicPem;
};

// The process's vouchd key and a second, unrelated one.
inline const KeyPair& VouchdKey() {
  static const TestCert cert = MakeSelfSignedCert("vouchd");
  static const KeyPair key{cert.privateKeyPem, cert.publicKeyPem};
  return key;
}
inline const KeyPair& OtherKey() {
  static const TestCert cert = MakeSelfSignedCert("other");
  static const KeyPair key{cert.privateKeyPem, cert.publicKeyPem};
  return key;
}

// Builds and signs one token. Claims are added as JSON ("exp" as a number,
// "aud" as an array where a test needs that).
class TokenBuilder {
 public:
  TokenBuilder() { jwt_new(&jwt_); }
  ~TokenBuilder() { jwt_free(jwt_); }

  // A token that passes every check at time `now` (seconds).
  static TokenBuilder Valid(long now) {
    TokenBuilder b;
    b.Claim("iss", "https://host/attestation").Claim("aud", "zyrd").Exp(now + 300);
    return b;
  }

  // Sets a string claim; an empty value removes it.
  TokenBuilder& Claim(const char* name, const char* value) {
    jwt_del_grants(jwt_, name);
    if (*value != '\0') jwt_add_grant(jwt_, name, value);
    return *this;
  }
  TokenBuilder& Exp(long value) {
    jwt_del_grants(jwt_, "exp");
    jwt_add_grant_int(jwt_, "exp", value);
    return *this;
  }
  TokenBuilder& Json(const char* json) {
    jwt_add_grants_json(jwt_, json);
    return *this;
  }

  std::string Sign(const KeyPair& key = VouchdKey()) {
    return Encode(JWT_ALG_RS256, key.privatePem);
  }
  std::string Encode(jwt_alg_t alg, const std::string& key) {
    jwt_set_alg(jwt_, alg, reinterpret_cast<const unsigned char*>(key.data()),
                static_cast<int>(key.size()));
    char* text = jwt_encode_str(jwt_);
    std::string out = text != nullptr ? text : "";
    free(text);
    return out;
  }

 private:
  jwt_t* jwt_ = nullptr;
};

}  // namespace ZyrdTest
