// ClientCertificateImpl: generate, install and read the client certificate
// and private key of a provider.
//
// Like every trust-material service: an empty provider is invalid_argument
// "provider"; changes hold "configLock" for write around the store work, the
// drop of the provider's cached client and the completion (create generates
// its key before taking it); get takes no lock; a provider that does not
// exist is not_found. Private keys are never logged.
#pragma once

#include <memory>

#include "services/client_certificate_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificateSvc {

class ClientCertificateImpl : public AsyncServiceInterface {
 public:
  explicit ClientCertificateImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers);

  // A new key and self-signed certificate replace the provider's.
  void create(const std::string& provider, ::Lumo::AsyncResult<void> result) override;
  // The certificate in its standardised form; the key only when asked for.
  void get(const std::string& provider, const std::optional<GetSpec>& spec,
           ::Lumo::AsyncResult<Info> result) override;
  // Installs the certificate as given, with the given key or, without one,
  // the key of the provider's pending CSR: private_key_unknown when there is
  // none, private_key_mismatch when the key does not belong to it.
  void set(const std::string& provider, const SetSpec& spec,
           ::Lumo::AsyncResult<void> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificateSvc
