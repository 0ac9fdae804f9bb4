#include "state/global_providers.h"

#include "config/config_lock.h"
#include "config/provider_config.h"
#include "kms/kmip_kms.h"

namespace Zyrd::State {
namespace {

class StoreBackend final : public ProvidersBackend {
 public:
  int ReadClientConfig(const std::string& name,
                       std::shared_ptr<const Kms::KmsInfo>& info) override {
    auto read = std::make_shared<Kms::KmsInfo>();
    int status = Config::ReadClientConfig(name, *read);
    if (status == 0) info = std::move(read);
    return status;
  }

  int ListProviderIds(std::vector<std::string>& ids) override {
    return Config::ListProviderIds(ids);
  }

  std::shared_ptr<Kms::Kms> MakeClient(std::shared_ptr<const Kms::KmsInfo> info) override {
    return std::make_shared<Kms::KmipKms>(std::move(info));
  }

  UserLock::RWLock& ConfigLock() override { return Config::ConfigLock(); }
};

}  // namespace

Providers& GlobalProviders() {
  static StoreBackend backend;
  static Providers providers(backend, Groundwork::SystemClock());
  return providers;
}

}  // namespace Zyrd::State
