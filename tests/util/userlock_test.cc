#include "platform/util/userlock.h"

#include <gtest/gtest.h>

#include <thread>

namespace {

using UserLock::ExclGuard;
using UserLock::ExclLockPtr;
using UserLock::ReadGuard;
using UserLock::RWLockPtr;
using UserLock::WriteGuard;

TEST(UserLock, IncreasingRanksNestAndUnrankedLocksAreNotTracked) {
  RWLockPtr config("configLock", 0xfeffffff);
  RWLockPtr state("state", 0xff000000);
  ExclLockPtr unranked("free", UserLock::kRankUnranked);
  {
    WriteGuard c(*config);
    ReadGuard s(*state);
    ExclGuard u(*unranked);
    EXPECT_EQ(UserLock::Rank::HeldCount(), 2u);
  }
  EXPECT_EQ(UserLock::Rank::HeldCount(), 0u);
}

TEST(UserLock, WritersExcludeEachOther) {
  RWLockPtr lock("shared", 0x100);
  int counter = 0;
  std::vector<std::thread> writers;
  for (int i = 0; i < 4; ++i) {
    writers.emplace_back([&] {
      for (int k = 0; k < 10000; ++k) {
        WriteGuard g(*lock);
        ++counter;
      }
    });
  }
  for (auto& t : writers) t.join();
  EXPECT_EQ(counter, 40000);
}

#ifdef ZYRD_LOCK_RANK_CHECK
// Out of rank order or a lock taken twice (equal ranks) panic instead of
// deadlocking some day.
TEST(UserLockDeathTest, TakingLocksOutOfRankOrderPanics) {
  EXPECT_DEATH(
      {
        RWLockPtr config("configLock", 0xfeffffff);
        RWLockPtr state("state", 0xff000000);
        ReadGuard s(*state);
        WriteGuard c(*config);
      },
      "Lock rank violation: acquiring 'configLock' \\(rank 0xfeffffff\\) while holding 'state'");
  EXPECT_DEATH(
      {
        RWLockPtr lock("auth", 0xff000000);
        ReadGuard first(*lock);
        ReadGuard second(*lock);
      },
      "Lock rank violation");
}
#endif

}  // namespace
