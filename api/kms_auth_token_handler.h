// The attestation token handler: accepts RS256 JWTs signed by the host's
// attestation daemon vouchd and reports the caller as "<ATTEST>" with the
// entitlement "@ATTEST+KEY_OPERATIONS".
//
// vouchd's public key (PEM) is read through `readKey` on the first call that
// needs it and cached for the life of the handler under the reader-writer
// lock "kms-auth-lock"; while it cannot be read, every call retries.
//
// Outcome per call:
//  - no result (the next handler may take the call): no key, no bearer
//    token, or a token that does not verify with vouchd's key;
//  - Unauthenticated "com.tarsel.orna.kms.authentication.invalid_token": a
//    token signed by vouchd that fails a check (algorithm RS256, "exp" not
//    before now, "iss" containing "/attestation", "aud" starting "zyrd");
//  - the authentication result otherwise.
//
// Checking a signature costs far more than the rest of a call, and a caller
// normally presents the same token for many calls. Tokens that passed every
// check are therefore remembered (by SHA-256 digest, with their expiry): a
// remembered token is accepted again without decoding while its "exp" is not
// before the current second; once it is, the token takes the full path again
// and is refused there as expired. Nothing else is remembered, so every
// refusal and its log lines are those of the full check.
// Thread-safe.
#pragma once

#include <array>
#include <functional>
#include <map>
#include <string>
#include <string_view>

#include "platform/lumo/authn.h"
#include "platform/util/hostinfo.h"
#include "platform/util/userlock.h"

namespace Zyrd::Authn {

class KmsAuthTokenHandler : public Lumo::Authn::AuthnHandler {
 public:
  static constexpr const char* kUsername = "<ATTEST>";
  static constexpr const char* kEntitlement = "@ATTEST+KEY_OPERATIONS";
  static constexpr const char* kResultName = "KmsAuthentication";

  // Fills `key` with vouchd's public key (PEM); false when it cannot.
  using KeyReader = std::function<bool(std::string& key)>;

  // `clock` gives the current time for the expiry check and must outlive the
  // handler.
  KmsAuthTokenHandler(KeyReader readKey, const Groundwork::Clock& clock);

  void Authenticate(const Lumo::Core::AsyncActivation& activation,
                    Lumo::Authn::AuthnCallback done) override;

 private:
  // At most this many tokens are remembered; when full, expired ones are
  // dropped, and if none has expired, all are.
  static constexpr size_t kMaxRememberedTokens = 4096;

  using Digest = std::array<unsigned char, 32>;

  // Fills the key cache when it is empty; false when no key is available.
  bool EnsureKey();
  bool Remembered(const Digest& digest, int64_t nowSeconds);
  void Remember(const Digest& digest, int64_t exp, int64_t nowSeconds);
  void Accept(std::string_view token, Lumo::Authn::AuthnCallback& done) const;

  KeyReader readKey_;
  const Groundwork::Clock& clock_;
  UserLock::RWLockPtr lock_;
  std::string key_;  // guarded by lock_
  UserLock::RWLockPtr rememberedLock_;
  std::map<Digest, int64_t> remembered_;  // digest -> "exp"; guarded by rememberedLock_
};

}  // namespace Zyrd::Authn
