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
// Thread-safe.
#pragma once

#include <functional>
#include <string>

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
  // Fills the key cache when it is empty; false when no key is available.
  bool EnsureKey();

  KeyReader readKey_;
  const Groundwork::Clock& clock_;
  UserLock::RWLockPtr lock_;
  std::string key_;  // guarded by lock_
};

}  // namespace Zyrd::Authn
