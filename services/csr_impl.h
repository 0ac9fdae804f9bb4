// CsrImpl: the pending certificate signing request of a provider, from
// which its client certificate is issued. Installing the signed certificate
// (client certificate set without a key) takes the key kept here.
//
// Like every trust-material service: an empty provider is invalid_argument
// "provider"; create and set generate or validate before taking "configLock"
// for write around the store write, the drop of the provider's cached
// client and the completion; get takes no lock. Private keys are never
// logged.
#pragma once

#include <memory>

#include "services/csr_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificate::CsrSvc {

class CsrImpl : public AsyncServiceInterface {
 public:
  explicit CsrImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers);

  // A new key and CSR replace the pending ones; both are returned.
  void create(const std::string& provider, ::Lumo::AsyncResult<Info> result) override;
  // The CSR in its standardised form; the key only when asked for.
  void get(const std::string& provider, const std::optional<GetSpec>& spec,
           ::Lumo::AsyncResult<Info> result) override;
  // Keeps a CSR made elsewhere, as given, with its key: invalid_argument
  // "clientCSR" unless the key belongs to it.
  void set(const std::string& provider, const SetSpec& spec,
           ::Lumo::AsyncResult<void> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificate::CsrSvc
