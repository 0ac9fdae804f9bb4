#include "platform/util/hostinfo.h"

#include <sys/time.h>
#include <time.h>

#include <cstdio>

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

std::string FormatUtcMillis(int64_t microsSinceEpoch) {
  time_t seconds = static_cast<time_t>(microsSinceEpoch / 1000000);
  struct tm tm;
  gmtime_r(&seconds, &tm);
  char text[64];
  snprintf(text, sizeof text, "%04d-%02d-%02dT%02d:%02d:%02d.%03dZ", tm.tm_year + 1900,
           tm.tm_mon + 1, tm.tm_mday, tm.tm_hour, tm.tm_min, tm.tm_sec,
           static_cast<int>((microsSinceEpoch / 1000) % 1000));
  return text;
}

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
