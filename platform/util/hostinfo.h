// Host clocks, and the Clock seam that time-dependent logic takes so tests can
// control time.
#pragma once

#include <cstdint>
#include <string>

// Monotonic time in nanoseconds (CLOCK_MONOTONIC); only differences matter.
uint64_t Hostinfo_SystemTimerNS();
// Wall-clock time in microseconds since the Unix epoch.
int64_t Hostinfo_GetTimeOfDay();

namespace Groundwork {

// "2026-12-06T09:43:00.123Z": UTC with milliseconds, for log and audit lines.
std::string FormatUtcMillis(int64_t microsSinceEpoch);

class Clock {
 public:
  virtual ~Clock() = default;
  virtual uint64_t MonotonicNs() const = 0;
  virtual int64_t RealtimeUs() const = 0;

  uint64_t MonotonicUs() const { return MonotonicNs() / 1000; }
};

// The host clocks above. Thread-safe, lives for the process.
const Clock& SystemClock();

}  // namespace Groundwork
