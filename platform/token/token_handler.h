// The platform token handler: accepts the host-local admin token, a secret
// kept in var/lib/zyrd/admin.token (under the root) that only root can read.
//
// The token is 32 random bytes in unpadded Base64url (43 characters). The
// file is created, mode 0600 in a 0700 directory, the first time the handler
// is built without one; it is read once, at construction. A caller presenting
// it as its bearer token is authenticated as "root" with the entitlement
// "@ORNA+KMS_ADMIN". Any other token is not this handler's: it completes with
// no result so the next stage may take the call.
//
// A token file that is not a regular file, is readable or writable by anyone
// but its owner, or is empty disables the admin token (logged at start-up).
// Thread-safe.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>

#include "platform/lumo/authn.h"
#include "platform/lumo/authz.h"
#include "platform/util/secure_buffer.h"

namespace Orna::Authn {

class TokenHandler : public Lumo::Authn::AuthnHandler {
 public:
  static constexpr const char* kDefaultTokenPath = "/var/lib/zyrd/admin.token";
  static constexpr const char* ENTITLEMENTS_GRANTS = "entitlements";
  static constexpr const char* kAdminEntitlement = "@ORNA+KMS_ADMIN";
  static constexpr const char* kAdminUser = "root";
  static constexpr size_t kTokenBytes = 32;

  // Fills `length` bytes with random data; false on failure.
  using RandomSource = std::function<bool(uint8_t* out, size_t length)>;

  // `tokenPath` is a full path (the daemon passes the root's admin.token).
  explicit TokenHandler(std::string tokenPath, RandomSource random = {});

  void Authenticate(const Lumo::Core::AsyncActivation& activation,
                    Lumo::Authn::AuthnCallback done) override;

  // Whether an admin token is available.
  bool Enabled() const { return !token_.empty(); }

 private:
  bool LoadOrCreate(const RandomSource& random);

  std::string path_;
  Groundwork::SecureString token_;
};

}  // namespace Orna::Authn

namespace OrnaToken::Authz {

// Grants when the caller's entitlements include one of those required.
class JwtEntitlementCheckerImpl : public Lumo::Authz::EntitlementChecker {
 public:
  bool HasAnyEntitlement(const Lumo::Authn::AuthenticationResult& caller,
                         const std::vector<std::string>& required) const override;
};

}  // namespace OrnaToken::Authz
