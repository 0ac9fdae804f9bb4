#include "daemon/stats.h"

#include <gtest/gtest.h>

#include "daemon/settings.h"
#include "platform/runtime/config.h"
#include "tests/support/fakes.h"
#include "tests/support/log_capture.h"

namespace {

using Zyrd::Stats::KeyStats;

class KeyStatsTest : public ::testing::Test {
 protected:
  // Records an operation that lasted `us` microseconds.
  void Op(bool success, uint64_t us) {
    uint64_t start = clock_.MonotonicUs();
    clock_.AdvanceUs(us);
    stats_.Record(success, start);
  }

  void StartWith(KeyStats& stats, const std::string& interval) {
    Strake::Service::Config config;
    Zyrd::Settings::WriteDefaults(config);
    if (!interval.empty()) {
      config.MergeXmlText("<config><statsLogIntervalSeconds>" + interval +
                          "</statsLogIntervalSeconds></config>");
    }
    stats.Start(config, scheduler_);
  }

  ZyrdTest::LogCapture log_;
  ZyrdTest::FakeClock clock_;
  ZyrdTest::ManualScheduler scheduler_;
  KeyStats stats_{clock_};
};

TEST_F(KeyStatsTest, IntervalIsClampedLoggedAndScheduled) {
  for (auto [configured, expected] :
       {std::pair{"", 300}, {"100", 300}, {"60", 300}, {"900", 900}, {"86400", 86400}}) {
    KeyStats stats(clock_);
    StartWith(stats, configured);
    EXPECT_EQ(stats.IntervalSeconds(), expected) << configured;
    EXPECT_TRUE(log_.Has(5, "Stats logging interval = " + std::to_string(expected) + "s\n"));
    EXPECT_EQ(scheduler_.LastDelay(), std::chrono::seconds(expected));
  }
  // The status and cache clamps are shown by the providers state that reads them.
  EXPECT_EQ(Zyrd::Settings::ClampStatsLogInterval(-1), 300);
  EXPECT_EQ(Zyrd::Settings::ClampStatsLogInterval(int64_t{1} << 40), INT32_MAX);
}

// The summary runs on its schedule, re-arms itself and resets nothing.
TEST_F(KeyStatsTest, ScheduledSummaryOfNoOperationsPrintsZerosAndRearms) {
  StartWith(stats_, "");
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_TRUE(log_.Has(5, "KEY STATS: success=0 (0/0/0 us) failed=0 (0 us)\n"));
  Op(true, 10);
  EXPECT_EQ(scheduler_.Pending(), 1u);
  ASSERT_TRUE(scheduler_.RunNext());
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_EQ(log_.Count("KEY STATS: success=1 (10/10/10 us)"), 2u);
}

// Failures, however short or long, leave the success figures alone.
TEST_F(KeyStatsTest, SummaryShowsMinAvgMaxAndFailures) {
  Op(true, 1500);
  Op(false, 200);
  Op(false, 9800);
  stats_.LogSummary();
  EXPECT_TRUE(log_.Has(5, "KEY STATS: success=1 (1500/1500/1500 us) failed=2 (5000 us)\n"));
  Op(true, 500);
  Op(true, 4000);
  stats_.LogSummary();
  EXPECT_TRUE(log_.Has(5, "KEY STATS: success=3 (500/2000/4000 us) failed=2 (5000 us)\n"));
}

TEST_F(KeyStatsTest, SumWrapResetsEveryCounter) {
  // A start time in the future makes the duration wrap to almost 2^64.
  stats_.Record(true, clock_.MonotonicUs() + 2);
  EXPECT_EQ(stats_.Snapshot().successCount, 1u);
  EXPECT_EQ(log_.Count("Resetting"), 0u);
  Op(false, 5);
  Op(true, 10);  // the success total wraps now
  EXPECT_TRUE(log_.Has(3, "KEY STATS: Resetting all counters to avoid overflow\n"));
  auto after = stats_.Snapshot();
  EXPECT_EQ(after.successCount + after.successMin + after.successMax + after.failureCount, 0u);
}

}  // namespace
