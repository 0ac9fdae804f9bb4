#include "daemon/stats.h"

#include "daemon/settings.h"
#include "platform/runtime/config.h"
#include "platform/util/log.h"

namespace Zyrd::Stats {

KeyStats::KeyStats(const Groundwork::Clock& clock) : clock_(clock), lock_("", 0xff000000) {}

void KeyStats::Start(const Strake::Service::Config& config,
                     Strake::System::Scheduler& scheduler) {
  int32_t interval =
      Settings::ClampStatsLogInterval(config.GetInt(Settings::kStatsLogInterval, 0));
  UserLock::ExclGuard guard(*lock_);
  intervalSeconds_ = interval;
  scheduler_ = &scheduler;
  Log_Level(5, "Stats logging interval = %ds\n", intervalSeconds_);
  ScheduleLogStatsLocked();
}

void KeyStats::Record(bool success, uint64_t startUs) {
  uint64_t duration = clock_.MonotonicUs() - startUs;
  UserLock::ExclGuard guard(*lock_);
  uint64_t successTotalBefore = successTotal_;
  uint64_t failureTotalBefore = failureTotal_;
  if (success) {
    if (duration > successMax_) successMax_ = duration;
    if (duration < successMin_) successMin_ = duration;
    successCount_ += 1;
    successTotal_ += duration;
  } else {
    failureTotal_ += duration;
    failureCount_ += 1;
  }
  if (successTotal_ < successTotalBefore || failureTotal_ < failureTotalBefore) {
    Log_Level(3, "KEY STATS: Resetting all counters to avoid overflow\n");
    ResetLocked();
  }
}

void KeyStats::LogSummary() {
  UserLock::ExclGuard guard(*lock_);
  Summary s = SnapshotLocked();
  Log_Level(5, "KEY STATS: success=%lu (%lu/%lu/%lu us) failed=%lu (%lu us)\n", s.successCount,
            s.successMin, s.successAvg, s.successMax, s.failureCount, s.failureAvg);
  ScheduleLogStatsLocked();
}

Summary KeyStats::Snapshot() const {
  UserLock::ExclGuard guard(*lock_);
  return SnapshotLocked();
}

Summary KeyStats::SnapshotLocked() const {
  Summary s;
  s.successCount = successCount_;
  s.successMin = successMin_ == kNoMinimum ? 0 : successMin_;
  s.successAvg = successCount_ == 0 ? 0 : successTotal_ / successCount_;
  s.successMax = successMax_;
  s.failureCount = failureCount_;
  s.failureAvg = failureCount_ == 0 ? 0 : failureTotal_ / failureCount_;
  return s;
}

void KeyStats::ResetLocked() {
  successCount_ = 0;
  successTotal_ = 0;
  successMin_ = kNoMinimum;
  successMax_ = 0;
  failureCount_ = 0;
  failureTotal_ = 0;
}

void KeyStats::ScheduleLogStatsLocked() {
  if (scheduler_ == nullptr) return;
  scheduler_->Schedule(std::chrono::microseconds(int64_t{intervalSeconds_} * 1000000),
                       [this] { LogSummary(); });
}

KeyStats& Global() {
  static KeyStats stats(Groundwork::SystemClock());
  return stats;
}

uint64_t NowUs() { return Hostinfo_SystemTimerNS() / 1000; }

}  // namespace Zyrd::Stats
