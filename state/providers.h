// The providers state: one live key server client per provider, built lazily
// from the configuration store, shared by requests, dropped when its
// configuration changes or the whole cache goes stale, and refreshed by a
// periodic status update.
//
// Thread-safe. Lock order: the configuration lock (rank 0xfeffffff) before
// the state lock (rank 0xff000000); client status refreshes run with neither
// held.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "kms/kms.h"
#include "kms/kms_info.h"
#include "platform/runtime/scheduler.h"
#include "platform/util/hostinfo.h"
#include "platform/util/userlock.h"
#include "state/provider_lookup.h"

namespace Strake::Service {
class Config;
}

namespace Zyrd::State {

// What the state needs from the rest of the daemon: provider records and
// client construction. The daemon passes the configuration store and the
// KMIP client; tests pass fakes.
class ProvidersBackend {
 public:
  virtual ~ProvidersBackend() = default;
  // A provider's client configuration; store status code (0 success).
  virtual int ReadClientConfig(const std::string& name,
                               std::shared_ptr<const Kms::KmsInfo>& info) = 0;
  virtual int ListProviderIds(std::vector<std::string>& ids) = 0;
  virtual std::shared_ptr<Kms::Kms> MakeClient(std::shared_ptr<const Kms::KmsInfo> info) = 0;
  // The process-wide configuration lock guarding the store.
  virtual UserLock::RWLock& ConfigLock() = 0;
};

struct ProvidersSettings {
  bool caching = true;
  int32_t statusUpdateIntervalSeconds = 300;  // 60..3600
  int32_t cacheStaleTimeoutSeconds = 1800;    // 70..3600
};

class Providers final : public ProviderLookup {
 public:
  // `backend` and `clock` must outlive the state.
  Providers(ProvidersBackend& backend, const Groundwork::Clock& clock);
  Providers(const Providers&) = delete;
  Providers& operator=(const Providers&) = delete;

  // Start-up: reads "caching", "statusUpdateIntervalSeconds" and
  // "cacheStaleTimeoutSeconds", clamps and logs them, and with caching on
  // starts the periodic status update on `scheduler` (which must outlive the
  // state).
  void Configure(const Strake::Service::Config& config, Strake::System::Scheduler& scheduler);

  // The provider's client, or null when it cannot be read from the store.
  // With caching off every call builds a fresh client.
  std::shared_ptr<Kms::Kms> GetProvider(const std::string& name) override;

  // Drops one provider's client (after any change to that provider).
  void DeleteProviderFromState(const std::string& name) override;
  // Drops every client (stale cache, configuration import).
  void DeleteAllProvidersFromState() override;

  // The scheduled item: refreshes every provider's status, then re-arms.
  void RunStatusUpdate();

  const ProvidersSettings& Settings() const { return settings_; }
  // Number of clients held (for diagnostics and tests).
  size_t Size() const;

 private:
  std::shared_ptr<Kms::Kms> AddProviderToState(const std::string& name);
  std::shared_ptr<Kms::Kms> Lookup(const std::string& name) const;
  bool CheckFresh();
  void ScheduleStatusUpdate();

  ProvidersBackend& backend_;
  const Groundwork::Clock& clock_;
  ProvidersSettings settings_;
  Strake::System::Scheduler* scheduler_ = nullptr;
  Strake::System::ScheduledItem pendingUpdate_;
  std::atomic<uint64_t> lastRefreshUs_{0};

  UserLock::RWLockPtr lock_;  // guards map_
  std::unordered_map<std::string, std::shared_ptr<Kms::Kms>> map_;
};

}  // namespace Zyrd::State
