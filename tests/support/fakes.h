// Deterministic stand-ins for the clock, the scheduler and the host firewall.
#pragma once

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <vector>

#include "platform/runtime/scheduler.h"
#include "platform/util/hostinfo.h"
#include "state/firewall.h"

namespace ZyrdTest {

class FakeClock : public Groundwork::Clock {
 public:
  uint64_t MonotonicNs() const override { return monotonicNs_.load(); }
  int64_t RealtimeUs() const override { return realtimeUs_.load(); }

  void SetMonotonicUs(uint64_t us) { monotonicNs_.store(us * 1000); }
  void AdvanceUs(uint64_t us) { monotonicNs_.fetch_add(us * 1000); }
  void SetRealtimeUs(int64_t us) { realtimeUs_.store(us); }

 private:
  std::atomic<uint64_t> monotonicNs_{1'000'000'000};
  std::atomic<int64_t> realtimeUs_{1'700'000'000'000'000};
};

// Keeps scheduled callbacks until the test runs them.
class ManualScheduler : public Strake::System::Scheduler {
 public:
  struct Item {
    std::chrono::microseconds delay;
    std::function<void()> fn;
    std::shared_ptr<bool> cancelled;
  };

  Strake::System::ScheduledItem Schedule(std::chrono::microseconds delay,
                                         std::function<void()> fn) override {
    std::lock_guard<std::mutex> lock(mutex_);
    auto cancelled = std::make_shared<bool>(false);
    items_.push_back({delay, std::move(fn), cancelled});
    return Strake::System::ScheduledItem([cancelled] { *cancelled = true; });
  }

  size_t Pending() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return items_.size();
  }

  std::chrono::microseconds LastDelay() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return items_.empty() ? std::chrono::microseconds(-1) : items_.back().delay;
  }

  // Runs the oldest pending callback (unless cancelled). False when none.
  bool RunNext() {
    Item item;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      if (items_.empty()) return false;
      item = std::move(items_.front());
      items_.erase(items_.begin());
    }
    if (!*item.cancelled) item.fn();
    return true;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<Item> items_;
};

// Records each ruleset change as "+host" or "-host"; the calls whose
// 1-based numbers are in `failOn` fail (and are recorded all the same).
class RecordingFirewall : public Zyrd::State::HostFirewall {
 public:
  bool AddOrRemoveServer(const std::string&, bool allow, const std::string& host) override {
    calls.push_back((allow ? "+" : "-") + host);
    return failOn.count(calls.size()) == 0;
  }

  std::vector<std::string> calls;
  std::set<size_t> failOn;
};

}  // namespace ZyrdTest
