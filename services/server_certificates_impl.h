// ServerCertificatesImpl: the list of key-server certificates a provider's
// connections trust, replaced whole and read back.
//
// Like every trust-material service: an empty provider is invalid_argument
// "provider"; set counts and validates before taking "configLock" for write
// around the store write, the drop of the provider's cached client and the
// completion; get takes no lock; a provider that does not exist is
// not_found.
#pragma once

#include <memory>

#include "services/server_certificates_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc {

class ServerCertificatesImpl : public AsyncServiceInterface {
 public:
  static constexpr size_t kMaxCertificates = 10;

  explicit ServerCertificatesImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers);

  // Stores the list as given, in order: unsupported (limit_error, num 10)
  // for more than 10 entries, invalid_argument "certificates" when any entry
  // is not a certificate; an empty list trusts nothing.
  void set(const std::string& provider, const std::vector<std::string>& certificates,
           ::Lumo::AsyncResult<void> result) override;
  // The stored certificates in their standardised form.
  void get(const std::string& provider, ::Lumo::AsyncResult<Info> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc
