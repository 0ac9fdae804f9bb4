// Key-operation statistics: counts and durations of generate_key and decrypt,
// summarised in the log at a fixed interval.
//
// One process-wide instance (Global()) serves the daemon; tests build their
// own over a fake clock and scheduler. Record and the summary are thread-safe;
// both take one exclusive lock and do nothing under it but arithmetic, the log
// call and scheduling the next summary.
#pragma once

#include <cstdint>
#include <limits>

#include "platform/runtime/scheduler.h"
#include "platform/util/hostinfo.h"
#include "platform/util/userlock.h"

namespace Strake::Service {
class Config;
}

namespace Zyrd::Stats {

inline constexpr uint64_t kNoMinimum = std::numeric_limits<uint64_t>::max();

// The figures a summary line prints (microseconds).
struct Summary {
  uint64_t successCount = 0;
  uint64_t successMin = 0;  // 0 while no success was recorded
  uint64_t successAvg = 0;
  uint64_t successMax = 0;
  uint64_t failureCount = 0;
  uint64_t failureAvg = 0;
};

class KeyStats {
 public:
  explicit KeyStats(const Groundwork::Clock& clock);
  KeyStats(const KeyStats&) = delete;
  KeyStats& operator=(const KeyStats&) = delete;

  // Reads "statsLogIntervalSeconds" (absent reads as 0, anything below 300
  // becomes 300), logs "Stats logging interval = %ds" and schedules the first
  // summary one interval from now on `scheduler`, which must outlive this.
  void Start(const Strake::Service::Config& config, Strake::System::Scheduler& scheduler);

  // Now on this object's clock (monotonic microseconds): the start time an
  // operation passes to Record.
  uint64_t NowUs() const { return clock_.MonotonicUs(); }

  // Records one operation that began at `startUs` (monotonic microseconds).
  void Record(bool success, uint64_t startUs);

  // The scheduled item: logs the summary line and schedules the next one.
  void LogSummary();

  Summary Snapshot() const;
  int32_t IntervalSeconds() const { return intervalSeconds_; }

 private:
  void ResetLocked();
  Summary SnapshotLocked() const;
  void ScheduleLogStatsLocked();

  const Groundwork::Clock& clock_;
  UserLock::ExclLockPtr lock_;
  Strake::System::Scheduler* scheduler_ = nullptr;
  int32_t intervalSeconds_ = 0;

  uint64_t successCount_ = 0;
  uint64_t successTotal_ = 0;
  uint64_t successMin_ = kNoMinimum;
  uint64_t successMax_ = 0;
  uint64_t failureCount_ = 0;
  uint64_t failureTotal_ = 0;
};

// The process-wide statistics over the host clock.
KeyStats& Global();

// Now, in microseconds of the host's monotonic timer: the start time that key
// operations pass to Record.
uint64_t NowUs();

}  // namespace Zyrd::Stats
