// Request traffic and error trackers of the host's API integration. This
// build keeps their counters in memory only; the daemon creates one of each at
// start-up and stops them at exit.
#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <memory>
#include <string_view>

#include "platform/runtime/logger.h"

namespace Kestrel::Common::StrakeLumo {

class TrafficTracker {
 public:
  explicit TrafficTracker(std::shared_ptr<Strake::Service::Logger> logger);
  void SetStopped(bool stopped) { stopped_.store(stopped); }
  bool Stopped() const { return stopped_.load(); }

 private:
  std::shared_ptr<Strake::Service::Logger> logger_;
  std::atomic<bool> stopped_{false};
};

class ErrorsTracker {
 public:
  // Counter categories, in this order.
  static constexpr std::array<std::string_view, 5> kCategories = {"access", "input", "service",
                                                                  "resource", "others"};

  explicit ErrorsTracker(std::shared_ptr<Strake::Service::Logger> logger);
  // Counts one error of `category`; unknown categories count as "others".
  void Count(std::string_view category);
  uint64_t Get(std::string_view category) const;
  void Stop();
  bool Stopped() const { return stopped_.load(); }

 private:
  size_t Index(std::string_view category) const;

  std::shared_ptr<Strake::Service::Logger> logger_;
  std::array<std::atomic<uint64_t>, kCategories.size()> counters_{};
  std::atomic<bool> stopped_{false};
};

}  // namespace Kestrel::Common::StrakeLumo
