// One-shot delayed callbacks.
//
// Scheduler is the seam that periodic work (status refresh, statistics) is
// written against; it re-arms itself by scheduling again from its callback.
// AsioScheduler runs callbacks on one thread of its own with steady-clock
// timers. All methods are thread-safe, including from inside a callback.
#pragma once

#include <boost/asio/io_context.hpp>
#include <boost/asio/steady_timer.hpp>
#include <chrono>
#include <functional>
#include <memory>
#include <thread>

namespace Strake::System {

// Handle of one scheduled callback. Cancel() stops it if it has not started;
// dropping the handle does not cancel.
class ScheduledItem {
 public:
  ScheduledItem() = default;
  explicit ScheduledItem(std::function<void()> cancel) : cancel_(std::move(cancel)) {}
  void Cancel() {
    if (cancel_) cancel_();
  }
  bool Valid() const { return static_cast<bool>(cancel_); }

 private:
  std::function<void()> cancel_;
};

class Scheduler {
 public:
  virtual ~Scheduler() = default;
  virtual ScheduledItem Schedule(std::chrono::microseconds delay, std::function<void()> fn) = 0;
};

class AsioScheduler final : public Scheduler {
 public:
  AsioScheduler();
  ~AsioScheduler() override;  // cancels pending callbacks and joins the thread
  ScheduledItem Schedule(std::chrono::microseconds delay, std::function<void()> fn) override;

 private:
  boost::asio::io_context io_;
  boost::asio::executor_work_guard<boost::asio::io_context::executor_type> work_;
  std::thread thread_;
};

}  // namespace Strake::System
