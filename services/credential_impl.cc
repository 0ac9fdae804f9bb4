#include "services/credential_impl.h"

#include "config/config_lock.h"
#include "config/trust_material.h"
#include "errors/error_builders.h"
#include "platform/util/feature_state.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc {

using Zyrd::ZyrApi::MakeInvalidParameterError;
using Zyrd::ZyrApi::MakeProviderStoreError;

CredentialImpl::CredentialImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void CredentialImpl::set(const std::string& provider, const Groundwork::SecureString& credential,
                         ::Lumo::AsyncResult<void> result) {
  if (provider.empty()) {
    Log_Level(2, "Credential set called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  std::string plain(credential.view());
  Groundwork::WipeOnExit wipe(plain);
  int rc = Zyrd::Config::SetCredential(provider, plain);
  if (rc != 0) {
    Log_Level(2, "Credential set failed for provider %s: %d\n", provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  providers_->DeleteProviderFromState(provider);
  result.SetResult();
}

void CredentialImpl::get(const std::string& provider, ::Lumo::AsyncResult<Info> result) {
  if (*FeatureList[kFeatureCredentialGet] == 0) {
    Log_Level(2, "Credential get is not supported\n");
    return result.SetError(Zyrd::ZyrApi::MakeError({}));
  }
  if (provider.empty()) {
    Log_Level(2, "Credential get called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  std::string stored;
  Groundwork::WipeOnExit wipe(stored);
  int rc = Zyrd::Config::GetCredential(provider, stored);
  if (rc != 0) {
    Log_Level(2, "Credential get failed for provider %s: %d\n", provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  result.SetResult(Info{Groundwork::SecureString(stored)});
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc
