// "configLock": the process-wide reader-writer lock over the configuration
// store and the provider records.
//
// Writers (every API operation that changes the store, for its whole run,
// and the providers state when it drops a stale cache) take it for write;
// building a provider's key server client takes it for read. Its rank
// (0xfeffffff) is below the providers state lock, so it is always taken
// first. The configuration layer itself never takes it.
#pragma once

#include <cstdint>

#include "platform/util/userlock.h"

namespace Zyrd::Config {

inline constexpr uint32_t kConfigLockRank = 0xfeffffff;

// The lock, created on first use (thread-safe).
UserLock::RWLock& ConfigLock();

}  // namespace Zyrd::Config
