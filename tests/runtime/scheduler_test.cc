#include "platform/runtime/scheduler.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <thread>

#include "platform/runtime/thread_pool.h"
#include "tests/support/time_scale.h"

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
  ASSERT_EQ(done.get_future().wait_for(ZyrdTest::Scaled(5s)), std::future_status::ready);
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
  ASSERT_EQ(later.get_future().wait_for(ZyrdTest::Scaled(5s)), std::future_status::ready);
  EXPECT_FALSE(ran.load());
}


// Long tasks (the endpoint's I/O loops) queued while an idle thread has not
// yet woken must still each get a thread of their own.
TEST(ThreadPool, TasksQueuedFasterThanIdleThreadsWakeEachGetAThread) {
  Strake::Service::ThreadPool pool(4, "t-");
  std::promise<void> release;
  auto gate = release.get_future().share();
  std::atomic<int> started{0};
  pool.Enqueue([&] { ++started; });  // one thread exists, then goes idle
  for (int i = 0; i < 500 && started.load() < 1; ++i) std::this_thread::sleep_for(2ms);
  std::this_thread::sleep_for(10ms);
  for (int i = 0; i < 3; ++i) {
    pool.Enqueue([&, gate] {
      ++started;
      gate.wait();
    });
  }
  for (int i = 0; i < 500 && started.load() < 4; ++i) std::this_thread::sleep_for(2ms);
  EXPECT_EQ(started.load(), 4);
  release.set_value();
}

}  // namespace
