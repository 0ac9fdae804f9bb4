// The daemon's configuration keys, their defaults, and the clamping applied
// where the interval settings are read.
#pragma once

#include <cstdint>

namespace Strake::Service {
class Config;
}

namespace Zyrd::Settings {

inline constexpr const char* kConfigPath = "/etc/tarsel/cpservices/zyrd/config.xml";
inline constexpr int kHttpPort = 7888;
inline constexpr int kIoWorkers = 5;

inline constexpr const char* kLogLevel = "log/level";
inline constexpr const char* kCaching = "caching";
inline constexpr const char* kStatusUpdateInterval = "statusUpdateIntervalSeconds";
inline constexpr const char* kCacheStaleTimeout = "cacheStaleTimeoutSeconds";
inline constexpr const char* kIoThreads = "strake/threadPool/ioThreads";
inline constexpr const char* kMaxThreads = "strake/threadPool/maxThreads";
inline constexpr const char* kStatsLogInterval = "statsLogIntervalSeconds";

// Writes the six defaults, in the order the runtime expects them.
void WriteDefaults(Strake::Service::Config& config);

// 60..3600 seconds.
int32_t ClampStatusUpdateInterval(int64_t seconds);
// 70..3600 seconds.
int32_t ClampCacheStaleTimeout(int64_t seconds);
// At least 300 seconds, no upper bound (beyond the 32-bit range).
int32_t ClampStatsLogInterval(int64_t seconds);

}  // namespace Zyrd::Settings
