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

  void StartWith(const char* xml) {
    Strake::Service::Config config;
    Zyrd::Settings::WriteDefaults(config);
    if (xml != nullptr) config.MergeXmlText(xml);
    stats_.Start(config, scheduler_);
  }

  ZyrdTest::LogCapture log_;
  ZyrdTest::FakeClock clock_;
  ZyrdTest::ManualScheduler scheduler_;
  KeyStats stats_{clock_};
};

TEST_F(KeyStatsTest, SummaryOfNoOperationsPrintsZeros) {
  StartWith(nullptr);
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_TRUE(log_.Has(5, "KEY STATS: success=0 (0/0/0 us) failed=0 (0 us)\n"));
}

TEST_F(KeyStatsTest, SummaryShowsMinAvgMaxAndFailures) {
  Op(true, 1500);
  Op(false, 200);
  stats_.LogSummary();
  EXPECT_TRUE(log_.Has(5, "KEY STATS: success=1 (1500/1500/1500 us) failed=1 (200 us)\n"));

  Op(true, 500);
  Op(true, 4000);
  Op(false, 400);
  stats_.LogSummary();
  EXPECT_TRUE(log_.Has(5, "KEY STATS: success=3 (500/2000/4000 us) failed=2 (300 us)\n"));
}

TEST_F(KeyStatsTest, FailuresLeaveSuccessFiguresAlone) {
  Op(true, 100);
  Op(false, 1);
  Op(false, 99999);
  auto s = stats_.Snapshot();
  EXPECT_EQ(s.successCount, 1u);
  EXPECT_EQ(s.successMin, 100u);
  EXPECT_EQ(s.successMax, 100u);
  EXPECT_EQ(s.successAvg, 100u);
  EXPECT_EQ(s.failureCount, 2u);
}

TEST_F(KeyStatsTest, SummaryDoesNotResetAndRearmsItself) {
  StartWith("<config><statsLogIntervalSeconds>900</statsLogIntervalSeconds></config>");
  EXPECT_EQ(scheduler_.LastDelay(), std::chrono::microseconds(900'000'000));
  Op(true, 10);
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_EQ(scheduler_.Pending(), 1u);
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_EQ(log_.Count("KEY STATS: success=1 (10/10/10 us)"), 2u);
}

TEST_F(KeyStatsTest, SumWrapResetsEveryCounter) {
  // A start time in the future makes the duration wrap to almost 2^64.
  stats_.Record(true, clock_.MonotonicUs() + 2);
  auto before = stats_.Snapshot();
  EXPECT_EQ(before.successCount, 1u);
  EXPECT_FALSE(log_.Has(3, "KEY STATS: Resetting all counters to avoid overflow\n"));
  Op(false, 5);
  Op(true, 10);  // the success total wraps now
  EXPECT_TRUE(log_.Has(3, "KEY STATS: Resetting all counters to avoid overflow\n"));
  auto after = stats_.Snapshot();
  EXPECT_EQ(after.successCount, 0u);
  EXPECT_EQ(after.successMin, 0u);
  EXPECT_EQ(after.successMax, 0u);
  EXPECT_EQ(after.failureCount, 0u);
}

struct IntervalCase {
  const char* xml;
  int expected;
};

class StatsIntervalTest : public KeyStatsTest, public ::testing::WithParamInterface<IntervalCase> {};

TEST_P(StatsIntervalTest, IsClampedAndLogged) {
  StartWith(GetParam().xml);
  EXPECT_EQ(stats_.IntervalSeconds(), GetParam().expected);
  EXPECT_TRUE(log_.Has(5, "Stats logging interval = " + std::to_string(GetParam().expected) +
                              "s\n"));
  EXPECT_EQ(scheduler_.LastDelay(), std::chrono::microseconds(int64_t{GetParam().expected} *
                                                              1'000'000));
}

INSTANTIATE_TEST_SUITE_P(
    Intervals, StatsIntervalTest,
    ::testing::Values(
        IntervalCase{nullptr, 300},
        IntervalCase{"<config><statsLogIntervalSeconds>100</statsLogIntervalSeconds></config>", 300},
        IntervalCase{"<config><statsLogIntervalSeconds>60</statsLogIntervalSeconds></config>", 300},
        IntervalCase{"<config><statsLogIntervalSeconds>900</statsLogIntervalSeconds></config>", 900},
        IntervalCase{"<config><statsLogIntervalSeconds>86400</statsLogIntervalSeconds></config>",
                     86400}));

TEST(Settings, IntervalClamps) {
  using namespace Zyrd::Settings;
  EXPECT_EQ(ClampStatusUpdateInterval(10), 60);
  EXPECT_EQ(ClampStatusUpdateInterval(300), 300);
  EXPECT_EQ(ClampStatusUpdateInterval(7200), 3600);
  EXPECT_EQ(ClampCacheStaleTimeout(0), 70);
  EXPECT_EQ(ClampCacheStaleTimeout(1800), 1800);
  EXPECT_EQ(ClampCacheStaleTimeout(5000), 3600);
  EXPECT_EQ(ClampStatsLogInterval(-1), 300);
  EXPECT_EQ(ClampStatsLogInterval(86400), 86400);
  EXPECT_EQ(ClampStatsLogInterval(int64_t{1} << 40), INT32_MAX);
}

}  // namespace
