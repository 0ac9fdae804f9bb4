// RemoteImpl: for each key server of a provider, in configured order, the
// certificate it presents and whether it is among the provider's trusted
// certificates. A server that cannot be reached is reported with a message
// in its own entry; the call itself succeeds. Reads nothing from the store
// but through the providers state, and writes nothing.
#pragma once

#include <memory>

#include "services/remote_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc {

class RemoteImpl : public AsyncServiceInterface {
 public:
  explicit RemoteImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers);

  // An empty provider is the bare invalid_argument, an unknown one the bare
  // not_found. With a spec, only the servers it names (when it names any)
  // and with the trust verdict it asks for (when it asks) are reported.
  void list(const std::string& provider, const std::optional<FilterSpec>& spec,
            const ::Lumo::Core::AsyncActivation& activation,
            ::Lumo::AsyncResult<std::vector<Summary>> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc
