#include "daemon/settings.h"

#include <algorithm>
#include <limits>

#include "platform/runtime/config.h"

namespace Zyrd::Settings {

void WriteDefaults(Strake::Service::Config& config) {
  config.SetString(kLogLevel, "info");
  config.SetBool(kCaching, true);
  config.SetInt(kStatusUpdateInterval, 300);
  config.SetInt(kCacheStaleTimeout, 1800);
  config.SetInt(kIoThreads, 1);
  config.SetInt(kMaxThreads, 10);
}

int32_t ClampStatusUpdateInterval(int64_t seconds) {
  return static_cast<int32_t>(std::clamp<int64_t>(seconds, 60, 3600));
}

int32_t ClampCacheStaleTimeout(int64_t seconds) {
  return static_cast<int32_t>(std::clamp<int64_t>(seconds, 70, 3600));
}

int32_t ClampStatsLogInterval(int64_t seconds) {
  return static_cast<int32_t>(
      std::clamp<int64_t>(seconds, 300, std::numeric_limits<int32_t>::max()));
}

}  // namespace Zyrd::Settings
