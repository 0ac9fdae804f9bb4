#include "state/providers.h"

#include "daemon/settings.h"
#include "platform/runtime/config.h"
#include "platform/util/log.h"

namespace Zyrd::State {

Providers::Providers(ProvidersBackend& backend, const Groundwork::Clock& clock)
    : backend_(backend), clock_(clock), lock_("", 0xff000000) {}

void Providers::Configure(const Strake::Service::Config& config,
                          Strake::System::Scheduler& scheduler) {
  settings_.caching = config.GetBool(Settings::kCaching, true);
  settings_.statusUpdateIntervalSeconds =
      Settings::ClampStatusUpdateInterval(config.GetInt(Settings::kStatusUpdateInterval, 300));
  settings_.cacheStaleTimeoutSeconds =
      Settings::ClampCacheStaleTimeout(config.GetInt(Settings::kCacheStaleTimeout, 1800));
  scheduler_ = &scheduler;
  Log_Level(5, "Status update interval = %d\n", settings_.statusUpdateIntervalSeconds);
  Log_Level(5, "Cache stale timeout seconds = %d\n", settings_.cacheStaleTimeoutSeconds);
  if (settings_.caching) {
    lastRefreshUs_.store(clock_.MonotonicUs());
    ScheduleStatusUpdate();
  }
}

bool Providers::CheckFresh() {
  uint64_t now = clock_.MonotonicUs();
  uint64_t ageSeconds = (now - lastRefreshUs_.load()) / 1000000;
  if (ageSeconds <= static_cast<uint64_t>(settings_.cacheStaleTimeoutSeconds)) return true;
  UserLock::WriteGuard config(backend_.ConfigLock());
  DeleteAllProvidersFromState();
  lastRefreshUs_.store(clock_.MonotonicUs());
  return false;
}

std::shared_ptr<Kms::Kms> Providers::Lookup(const std::string& name) const {
  UserLock::ReadGuard guard(*lock_);
  auto it = map_.find(name);
  return it == map_.end() ? nullptr : it->second;
}

std::shared_ptr<Kms::Kms> Providers::GetProvider(const std::string& name) {
  if (settings_.caching && CheckFresh()) {
    if (auto client = Lookup(name)) return client;
  }
  UserLock::ReadGuard config(backend_.ConfigLock());
  return AddProviderToState(name);
}

std::shared_ptr<Kms::Kms> Providers::AddProviderToState(const std::string& name) {
  std::shared_ptr<const Kms::KmsInfo> info;
  if (backend_.ReadClientConfig(name, info) != 0 || !info) {
    Log_Level(3, "Error getting provider %s\n", name.c_str());
    return nullptr;
  }
  std::shared_ptr<Kms::Kms> client = backend_.MakeClient(std::move(info));
  if (!settings_.caching) return client;

  std::shared_ptr<Kms::Kms> held;
  {
    UserLock::WriteGuard guard(*lock_);
    held = map_.try_emplace(name, std::move(client)).first->second;
  }
  Log_Level(5, "Added provider %s to providers state\n", name.c_str());
  return held;
}

void Providers::DeleteProviderFromState(const std::string& name) {
  {
    UserLock::WriteGuard guard(*lock_);
    map_.erase(name);
  }
  Log_Level(5, "Deleted provider %s from providers state\n", name.c_str());
}

void Providers::DeleteAllProvidersFromState() {
  {
    UserLock::WriteGuard guard(*lock_);
    map_.clear();
  }
  Log_Level(5, "Deleted all providers from providers state\n");
}

size_t Providers::Size() const {
  UserLock::ReadGuard guard(*lock_);
  return map_.size();
}

void Providers::ScheduleStatusUpdate() {
  if (scheduler_ == nullptr) return;
  pendingUpdate_ = scheduler_->Schedule(
      std::chrono::microseconds(int64_t{settings_.statusUpdateIntervalSeconds} * 1000000),
      [this] { RunStatusUpdate(); });
}

void Providers::RunStatusUpdate() {
  Log_Level(6, "Updating status\n");
  std::vector<std::string> ids;
  if (backend_.ListProviderIds(ids) == 0) {
    std::vector<std::shared_ptr<Kms::Kms>> clients;
    {
      UserLock::ReadGuard config(backend_.ConfigLock());
      for (const auto& id : ids) {
        auto client = Lookup(id);
        if (!client) client = AddProviderToState(id);
        if (client) clients.push_back(std::move(client));
      }
    }
    for (const auto& client : clients) client->UpdateStatus();
    lastRefreshUs_.store(clock_.MonotonicUs());
  }
  ScheduleStatusUpdate();
}

}  // namespace Zyrd::State
