// ProvidersImpl: list, read, create, change and delete key providers.
//
// Create, update and delete hold "configLock" for write for their whole run
// (and complete before releasing it), so they are serialised with each other
// and with every other change to the store; list and get take no lock. Each
// change keeps the firewall ruleset in step with the hosts the providers
// use, and a change to an existing provider drops its cached client.
#pragma once

#include <memory>

#include "services/providers_svc.h"
#include "state/firewall.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::ProvidersSvc {

class ProvidersImpl : public AsyncServiceInterface {
 public:
  // `firewall` must outlive this object.
  ProvidersImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers,
                Zyrd::State::Firewall& firewall);

  void list(::Lumo::AsyncResult<std::vector<Summary>> result) override;
  // Refuses, as invalid_argument naming the first bad field: an empty
  // provider or masterKeyId, a type other than KMIP, a description or
  // username given empty, a proxy without a usable hostname, an empty server
  // list, a server name or hostname that is empty or repeated, a server
  // hostname equal to the proxy's, a hostname with blanks or control
  // characters, and a port outside 1..65535. Unset ports are stored as 5696
  // (servers) and 443 (proxy). An existing provider gives already_exists.
  void create(const CreateSpec& spec, ::Lumo::AsyncResult<void> result) override;
  // Changes what the request gives; servers, when given, replace the whole
  // list, and a proxy with an empty hostname removes the proxy.
  void update(const std::string& provider, const UpdateSpec& spec,
              ::Lumo::AsyncResult<void> result) override;
  // Removes the provider with its trust material; hosts another provider
  // still uses stay in the firewall ruleset.
  void delete_(const std::string& provider, ::Lumo::AsyncResult<void> result) override;
  void get(const std::string& provider, ::Lumo::AsyncResult<Info> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
  Zyrd::State::Firewall& firewall_;
};

}  // namespace Com::Tarsel::Orna::Kms::ProvidersSvc
