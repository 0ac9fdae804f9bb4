#include "api/kms_auth_token_handler.h"

#include <jwt.h>
#include <openssl/sha.h>

#include <algorithm>
#include <memory>

#include "errors/error_builders.h"
#include "platform/util/log.h"

namespace Zyrd::Authn {
namespace {

struct JwtFree {
  void operator()(jwt_t* jwt) const { jwt_free(jwt); }
};
using JwtPtr = std::unique_ptr<jwt_t, JwtFree>;

constexpr uint32_t kAuthLockRank = 0xff000000;

// Checks a token whose signature verified: the first failing check logs its
// line and returns false. `exp` receives the token's expiry.
bool CheckClaims(jwt_t* jwt, int64_t nowSeconds, int64_t& expOut) {
  jwt_alg_t alg = jwt_get_alg(jwt);
  if (alg != JWT_ALG_RS256) {
    Log_Level(2, "Token algorithm is invalid: %d\n", static_cast<int>(alg));
    return false;
  }
  long exp = jwt_get_grant_int(jwt, "exp");
  if (exp < 0) exp = 0;
  expOut = exp;
  if (exp < nowSeconds) {
    Log_Level(2, "Token is expired\n");
    return false;
  }
  const char* iss = jwt_get_grant(jwt, "iss");
  if (iss == nullptr || std::string_view(iss).find("/attestation") == std::string_view::npos) {
    Log_Level(2, "Jwt issuer grant is invalid: %s\n", iss != nullptr ? iss : "");
    return false;
  }
  const char* aud = jwt_get_grant(jwt, "aud");
  if (aud == nullptr || std::string_view(aud).substr(0, 4) != "zyrd") {
    Log_Level(2, "Jwt aud grant is invalid: %s\n", aud != nullptr ? aud : "");
    return false;
  }
  return true;
}

}  // namespace

KmsAuthTokenHandler::KmsAuthTokenHandler(KeyReader readKey, const Groundwork::Clock& clock)
    : readKey_(std::move(readKey)),
      clock_(clock),
      lock_("kms-auth-lock", kAuthLockRank),
      rememberedLock_("kms-auth-tokens", kAuthLockRank) {}

bool KmsAuthTokenHandler::Remembered(const Digest& digest, int64_t nowSeconds) {
  UserLock::ReadGuard read(*rememberedLock_);
  auto it = remembered_.find(digest);
  return it != remembered_.end() && it->second >= nowSeconds;
}

void KmsAuthTokenHandler::Remember(const Digest& digest, int64_t exp, int64_t nowSeconds) {
  UserLock::WriteGuard write(*rememberedLock_);
  if (remembered_.size() >= kMaxRememberedTokens) {
    std::erase_if(remembered_, [&](const auto& entry) { return entry.second < nowSeconds; });
    if (remembered_.size() >= kMaxRememberedTokens) remembered_.clear();
  }
  remembered_[digest] = exp;
}

void KmsAuthTokenHandler::Accept(std::string_view token, Lumo::Authn::AuthnCallback& done) const {
  auto result = std::make_shared<Lumo::Authn::AuthenticationResult>();
  result->name = kResultName;
  result->accessToken.assign(token);
  result->username = kUsername;
  result->entitlements = {kEntitlement};
  done({std::move(result), nullptr});
}

bool KmsAuthTokenHandler::EnsureKey() {
  {
    UserLock::ReadGuard read(*lock_);
    if (!key_.empty()) return true;
  }
  UserLock::WriteGuard write(*lock_);
  if (!key_.empty()) return true;
  std::string key;
  if (!readKey_ || !readKey_(key) || key.empty()) {
    Log_Level(2, "Error retrieving vouchd pubkey\n");
    return false;
  }
  key_ = std::move(key);
  Log_Level(6, "Successfully cached vouchd public key\n");
  return true;
}

void KmsAuthTokenHandler::Authenticate(const Lumo::Core::AsyncActivation& activation,
                                       Lumo::Authn::AuthnCallback done) {
  if (!EnsureKey()) {
    done({});
    return;
  }
  Lumo::Core::OAuthSecurityContextReader reader(activation.securityContext);
  if (!reader.IsValid()) {
    Log_Level(6, "OAuth security context is invalid\n");
    done({});
    return;
  }
  const int64_t now = clock_.RealtimeUs() / 1000000;
  Digest digest;
  SHA256(reinterpret_cast<const unsigned char*>(reader.accessToken().data()),
         reader.accessToken().size(), digest.data());
  if (Remembered(digest, now)) {
    Accept(reader.accessToken(), done);
    return;
  }

  // The context's token is NUL-terminated: it lives in a string.
  const char* token = activation.securityContext.accessToken.data();
  JwtPtr jwt;
  {
    UserLock::ReadGuard read(*lock_);
    jwt_t* decoded = nullptr;
    if (jwt_decode(&decoded, token, reinterpret_cast<const unsigned char*>(key_.data()),
                   static_cast<int>(key_.size())) == 0) {
      jwt.reset(decoded);
    }
  }
  if (jwt == nullptr) {
    Log_Level(6, "Not an attestation token\n");
    done({});
    return;
  }
  int64_t exp = 0;
  if (!CheckClaims(jwt.get(), now, exp)) {
    Log_Level(2, "Attestation token validation failed\n");
    Lumo::NamedMessageBuilder message("com.tarsel.orna.kms.authentication.invalid_token");
    const Lumo::L10n::Localizer& localizer = activation.requestLocalizer != nullptr
                                                 ? *activation.requestLocalizer
                                                 : ZyrApi::CatalogueLocalizer();
    jwt.reset();
    done({nullptr,
          ZyrApi::MakeUnauthenticatedError(
              Lumo::L10n::LocalizableMessageHelpers::ConvertMessages(localizer, {message}))});
    return;
  }
  jwt.reset();
  Remember(digest, exp, now);
  Accept(reader.accessToken(), done);
}

}  // namespace Zyrd::Authn
