// RawConfigImpl: export the providers configuration as a gzip blob with its
// digest, and replace it with such a blob.
//
// set holds "configLock" for write around the import and completes before
// releasing it; get takes no lock. set does not change the firewall
// ruleset: imported hosts are opened at the next start-up.
#pragma once

#include <cstddef>
#include <memory>

#include "services/raw_config_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::RawConfigSvc {

class RawConfigImpl : public AsyncServiceInterface {
 public:
  // Largest uncompressed configuration set accepts.
  static constexpr size_t kMaxConfigurationSize = size_t{64} << 20;

  explicit RawConfigImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers);

  // The digest always; the compressed export too when asked with
  // CONFIG_AND_HASH. Any other info type is invalid_argument.
  void get(const std::optional<InfoType>& infoType, ::Lumo::AsyncResult<Info> result) override;
  // Refuses, as invalid_argument "configuration" with nothing changed: an
  // empty blob, one that is not gzip data or inflates beyond
  // kMaxConfigurationSize, and an export that names anything but the
  // providers or gives a provider value another type. On success every
  // cached client is dropped.
  void set(const Groundwork::SecureBytes& configuration, ::Lumo::AsyncResult<void> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
};

}  // namespace Com::Tarsel::Orna::Kms::RawConfigSvc
