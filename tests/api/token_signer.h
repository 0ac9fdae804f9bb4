// Deterministic attestation tokens for tests: an RSA key pair made once per
// process and JWTs signed with it (or with anything else a test needs).
#pragma once

#include <jwt.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/rsa.h>

#include <memory>
#include <string>

namespace ZyrdTest {

struct KeyPair {
  std::string privatePem;
  std::string publicPem;

  static KeyPair Generate() {
    EVP_PKEY* key = EVP_RSA_gen(2048);
    KeyPair out{Pem(key, true), Pem(key, false)};
    EVP_PKEY_free(key);
    return out;
  }

 private:
  static std::string Pem(EVP_PKEY* key, bool isPrivate) {
    BIO* bio = BIO_new(BIO_s_mem());
    if (isPrivate) {
      PEM_write_bio_PrivateKey(bio, key, nullptr, nullptr, 0, nullptr, nullptr);
    } else {
      PEM_write_bio_PUBKEY(bio, key);
    }
    char* data = nullptr;
    long length = BIO_get_mem_data(bio, &data);
    std::string out(data, static_cast<size_t>(length));
    BIO_free(bio);
    return out;
  }
};

// The process's vouchd key and a second, unrelated one.
inline const KeyPair& VouchdKey() {
  static const KeyPair key = KeyPair::Generate();
  return key;
}
inline const KeyPair& OtherKey() {
  static const KeyPair key = KeyPair::Generate();
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

  TokenBuilder& Claim(const char* name, const char* value) {
    jwt_add_grant(jwt_, name, value);
    return *this;
  }
  TokenBuilder& Remove(const char* name) {
    jwt_del_grants(jwt_, name);
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
