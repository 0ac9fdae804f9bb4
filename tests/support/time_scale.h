// Time-outs in tests are upper bounds; builds that run several times slower
// (the thread sanitizer's) stretch them all by ZYRD_TEST_TIME_SCALE.
#pragma once

#include <algorithm>
#include <chrono>
#include <cstdlib>

namespace ZyrdTest {

template <class Rep, class Period>
std::chrono::duration<double, Period> Scaled(std::chrono::duration<Rep, Period> timeout) {
  const char* text = std::getenv("ZYRD_TEST_TIME_SCALE");
  const double scale = text ? std::strtod(text, nullptr) : 1.0;
  return std::chrono::duration<double, Period>(timeout) * std::max(scale, 1.0);
}

}  // namespace ZyrdTest
