#include "platform/ssl/trackers.h"

namespace Kestrel::Common::StrakeLumo {

TrafficTracker::TrafficTracker(std::shared_ptr<Strake::Service::Logger> logger)
    : logger_(std::move(logger)) {}

ErrorsTracker::ErrorsTracker(std::shared_ptr<Strake::Service::Logger> logger)
    : logger_(std::move(logger)) {}

size_t ErrorsTracker::Index(std::string_view category) const {
  for (size_t i = 0; i < kCategories.size(); ++i) {
    if (kCategories[i] == category) return i;
  }
  return kCategories.size() - 1;
}

void ErrorsTracker::Count(std::string_view category) {
  if (!stopped_.load()) counters_[Index(category)].fetch_add(1, std::memory_order_relaxed);
}

uint64_t ErrorsTracker::Get(std::string_view category) const {
  return counters_[Index(category)].load(std::memory_order_relaxed);
}

void ErrorsTracker::Stop() { stopped_.store(true); }

}  // namespace Kestrel::Common::StrakeLumo
