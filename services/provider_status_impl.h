// StatusImpl of the provider status service: one provider's health from the
// key server client's status (normally the cache the periodic refresh
// keeps), the certificates the servers present and the client certificate.
// Writes nothing; takes no lock of its own.
//
// Health per server: ERROR when the daemon and the server do not trust each
// other; WARNING when no trusted certificates are configured, the server's
// certificate cannot be had, or the trusted certificate it presents expires
// within 30 days; HEALTHY otherwise. For the provider: ERROR without a
// usable master key on any server, WARNING when every server is in warning
// or the client certificate is missing, unreadable or expires within 30
// days, HEALTHY otherwise. Attestation-token callers get the provider's
// health and messages without the server list.
#pragma once

#include <memory>

#include "services/provider_status_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc {

class StatusImpl : public AsyncServiceInterface {
 public:
  static constexpr int64_t kExpiryWarningDays = 30;

  explicit StatusImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers);

  // An empty provider is the bare invalid_argument, an unknown one the bare
  // not_found.
  void get(const std::string& provider, const ::Lumo::Core::AsyncActivation& activation,
           ::Lumo::AsyncResult<Info> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc
