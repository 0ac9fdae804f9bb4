// A writer process killed with SIGKILL at random moments must leave a store
// that opens cleanly, holds every write that returned, and holds nothing
// half-written.
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <random>
#include <thread>

#include "tests/configstore/store_fixture.h"

namespace {

using namespace ZyrdTest;

constexpr uint32_t kNames = 7;
constexpr int kRounds = 12;
constexpr int kMaxAcksPerRound = 20;

// Write number `j` stores provider "p<j % kNames>" at generation j; each
// object's every value depends on its generation, so a torn write shows.
std::string NameOf(uint32_t j) { return "p" + std::to_string(j % kNames); }

// Child: writes from `first` on, reporting each write that returned.
[[noreturn]] void RunWriter(const std::string& path, uint32_t first, int ackFd) {
  try {
    auto store = SqliteConfigStore::Open(path);
    for (uint32_t j = first;; ++j) {
      auto object = SampleProvider(NameOf(j), j);
      if (store->GetObject(object->GetConfigStoreObjectId())) {
        store->UpdateObject(object, 0);
      } else {
        store->WriteObject(object, 0);
      }
      if (write(ackFd, &j, sizeof j) != sizeof j) _exit(2);
    }
  } catch (...) {
    _exit(3);
  }
}

// The generation of each name after the first `n` writes.
std::map<std::string, uint32_t> StateAfter(uint32_t n) {
  std::map<std::string, uint32_t> state;
  for (uint32_t j = 0; j < n; ++j) state[NameOf(j)] = j;
  return state;
}

bool StoreHolds(SqliteConfigStore& store, const std::map<std::string, uint32_t>& expected) {
  auto stored = store.GetObjectsByFilter(ProvidersFilter());
  if (stored.size() != expected.size()) return false;
  for (const auto& object : stored) {
    auto it = expected.find(object->GetConfigStoreObjectId().GetInstanceId());
    if (it == expected.end() || Codec::EncodeObject(*object) !=
                                    Codec::EncodeObject(*SampleProvider(it->first, it->second))) {
      return false;
    }
  }
  return true;
}

}  // namespace

namespace {

TEST(CrashSafety, KilledWriterKeepsEveryReturnedWriteAndNothingTorn) {
  TempDir dir;
  const std::string path = dir / "zyrd/configstore.db";
  // ZYRD_CRASH_SEED replays a run; the seed of each run is printed.
  const char* seedText = std::getenv("ZYRD_CRASH_SEED");
  const uint32_t seed = seedText != nullptr
                            ? static_cast<uint32_t>(std::strtoul(seedText, nullptr, 10))
                            : std::random_device{}();
  std::printf("crash test seed: ZYRD_CRASH_SEED=%u\n", seed);
  SCOPED_TRACE("ZYRD_CRASH_SEED=" + std::to_string(seed));
  std::mt19937 rng(seed);
  uint32_t acked = 0;  // writes that returned, over all rounds

  for (int round = 0; round < kRounds; ++round) {
    int fds[2];
    ASSERT_EQ(pipe(fds), 0);
    pid_t pid = fork();
    ASSERT_GE(pid, 0);
    if (pid == 0) {
      close(fds[0]);
      RunWriter(path, acked, fds[1]);
    }
    close(fds[1]);

    // Let a random number of writes return, then kill at a random moment.
    int wanted = std::uniform_int_distribution<int>(1, kMaxAcksPerRound)(rng);
    uint32_t j;
    for (int got = 0; got < wanted && read(fds[0], &j, sizeof j) == sizeof j; ++got) acked = j + 1;
    std::this_thread::sleep_for(
        std::chrono::microseconds(std::uniform_int_distribution<int>(0, 3000)(rng)));
    kill(pid, SIGKILL);
    int status = 0;
    waitpid(pid, &status, 0);
    ASSERT_TRUE(WIFSIGNALED(status)) << "writer failed with status " << WEXITSTATUS(status);
    while (read(fds[0], &j, sizeof j) == sizeof j) acked = j + 1;  // acks still in the pipe
    close(fds[0]);

    // The write in flight at the kill may or may not have committed.
    auto store = SqliteConfigStore::Open(path);
    EXPECT_TRUE(StoreHolds(*store, StateAfter(acked)) || StoreHolds(*store, StateAfter(acked + 1)))
        << "round " << round << " after " << acked << " returned writes";
  }
  EXPECT_GT(acked, static_cast<uint32_t>(kRounds));
}

}  // namespace
