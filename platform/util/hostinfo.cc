#include "platform/util/hostinfo.h"

#include <sys/time.h>
#include <time.h>

uint64_t Hostinfo_SystemTimerNS() {
  struct timespec ts;
  clock_gettime(CLOCK_MONOTONIC, &ts);
  return static_cast<uint64_t>(ts.tv_sec) * 1000000000ull + static_cast<uint64_t>(ts.tv_nsec);
}

int64_t Hostinfo_GetTimeOfDay() {
  struct timeval tv;
  gettimeofday(&tv, nullptr);
  return static_cast<int64_t>(tv.tv_sec) * 1000000 + tv.tv_usec;
}

namespace Groundwork {
namespace {

class HostClock final : public Clock {
 public:
  uint64_t MonotonicNs() const override { return Hostinfo_SystemTimerNS(); }
  int64_t RealtimeUs() const override { return Hostinfo_GetTimeOfDay(); }
};

}  // namespace

const Clock& SystemClock() {
  static const HostClock clock;
  return clock;
}

}  // namespace Groundwork
