#include "platform/util/userlock.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

namespace {

using UserLock::ExclGuard;
using UserLock::ExclLockPtr;
using UserLock::ReadGuard;
using UserLock::RWLockPtr;
using UserLock::WriteGuard;

TEST(UserLock, IncreasingRanksNest) {
  RWLockPtr config("configLock", 0xfeffffff);
  RWLockPtr state("state", 0xff000000);
  {
    WriteGuard c(*config);
    ReadGuard s(*state);
    EXPECT_EQ(UserLock::Rank::HeldCount(), 2u);
  }
  EXPECT_EQ(UserLock::Rank::HeldCount(), 0u);
}

TEST(UserLock, ReadersShareWritersExclude) {
  RWLockPtr lock("shared", 0x100);
  std::atomic<int> readersInside{0};
  std::atomic<int> maxReaders{0};
  std::vector<std::thread> readers;
  for (int i = 0; i < 4; ++i) {
    readers.emplace_back([&] {
      ReadGuard g(*lock);
      int now = ++readersInside;
      int prev = maxReaders.load();
      while (now > prev && !maxReaders.compare_exchange_weak(prev, now)) {
      }
      std::this_thread::sleep_for(std::chrono::milliseconds(20));
      --readersInside;
    });
  }
  for (auto& t : readers) t.join();
  EXPECT_GT(maxReaders.load(), 1);

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
TEST(UserLockDeathTest, TakingALowerRankWhileHoldingAHigherOnePanics) {
  EXPECT_DEATH(
      {
        RWLockPtr config("configLock", 0xfeffffff);
        RWLockPtr state("state", 0xff000000);
        ReadGuard s(*state);
        WriteGuard c(*config);
      },
      "Lock rank violation: acquiring 'configLock' \\(rank 0xfeffffff\\) while holding 'state'");
}

TEST(UserLockDeathTest, EqualRanksDoNotNest) {
  EXPECT_DEATH(
      {
        ExclLockPtr a("a", 0xff000000);
        ExclLockPtr b("b", 0xff000000);
        ExclGuard ga(*a);
        ExclGuard gb(*b);
      },
      "Lock rank violation");
}

TEST(UserLockDeathTest, RetakingAHeldLockPanicsInsteadOfDeadlocking) {
  EXPECT_DEATH(
      {
        RWLockPtr lock("auth", 0xff000000);
        ReadGuard first(*lock);
        ReadGuard second(*lock);
      },
      "Lock rank violation");
}
#endif

TEST(UserLock, UnrankedLocksAreNotChecked) {
  ExclLockPtr high("high", 0xff000000);
  ExclLockPtr unranked("free", UserLock::kRankUnranked);
  ExclGuard h(*high);
  ExclGuard u(*unranked);
  EXPECT_EQ(UserLock::Rank::HeldCount(), 1u);
}

}  // namespace
