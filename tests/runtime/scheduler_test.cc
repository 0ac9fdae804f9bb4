#include "platform/runtime/scheduler.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>

namespace {

using namespace std::chrono_literals;

TEST(AsioScheduler, RunsOnceAfterTheDelayAndCanRearmFromTheCallback) {
  Strake::System::AsioScheduler scheduler;
  std::promise<void> done;
  std::atomic<int> runs{0};
  std::function<void()> tick = [&] {
    if (++runs < 3) {
      scheduler.Schedule(1ms, tick);
    } else {
      done.set_value();
    }
  };
  auto start = std::chrono::steady_clock::now();
  scheduler.Schedule(20ms, tick);
  ASSERT_EQ(done.get_future().wait_for(5s), std::future_status::ready);
  EXPECT_GE(std::chrono::steady_clock::now() - start, 20ms);
  EXPECT_EQ(runs.load(), 3);
}

TEST(AsioScheduler, CancelledItemNeverRuns) {
  Strake::System::AsioScheduler scheduler;
  std::atomic<bool> ran{false};
  auto item = scheduler.Schedule(50ms, [&] { ran = true; });
  item.Cancel();
  std::promise<void> later;
  scheduler.Schedule(100ms, [&] { later.set_value(); });
  ASSERT_EQ(later.get_future().wait_for(5s), std::future_status::ready);
  EXPECT_FALSE(ran.load());
}

}  // namespace
