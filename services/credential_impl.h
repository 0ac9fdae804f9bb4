// CredentialImpl: stores a provider's KMIP credential and, where the host
// enables it ("features/credentialGet"), reads it back.
//
// Like every trust-material service: an empty provider is invalid_argument
// "provider"; set holds "configLock" for write around the store write, the
// drop of the provider's cached client and the completion; get takes no
// lock; a provider that does not exist is not_found. The credential is never
// logged.
#pragma once

#include <memory>

#include "services/credential_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc {

class CredentialImpl : public AsyncServiceInterface {
 public:
  explicit CredentialImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers);

  // Any string, the empty one included, is stored as it is.
  void set(const std::string& provider, const Groundwork::SecureString& credential,
           ::Lumo::AsyncResult<void> result) override;
  // With the feature off, the bare error whatever the provider.
  void get(const std::string& provider, ::Lumo::AsyncResult<Info> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc
