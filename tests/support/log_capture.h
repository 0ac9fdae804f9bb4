// Captures log records for the lifetime of the object.
#pragma once

#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/util/log.h"

namespace ZyrdTest {

struct LogLine {
  int level;
  std::string text;
};

class LogCapture : public Groundwork::LogSink {
 public:
  explicit LogCapture(int threshold = 7) : savedThreshold_(Groundwork::GetLogThreshold()) {
    Groundwork::SetLogThreshold(threshold);
    Groundwork::SetLogSink(this);
  }
  ~LogCapture() override {
    Groundwork::SetLogSink(nullptr);
    Groundwork::SetLogThreshold(savedThreshold_);
  }

  void Write(int level, std::string_view text) override {
    std::lock_guard<std::mutex> lock(mutex_);
    lines_.push_back({level, std::string(text)});
  }

  std::vector<LogLine> Lines() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return lines_;
  }

  // Whether some record has exactly this level and text.
  bool Has(int level, std::string_view text) const {
    std::lock_guard<std::mutex> lock(mutex_);
    for (const auto& l : lines_) {
      if (l.level == level && l.text == text) return true;
    }
    return false;
  }

  // Number of records whose text contains `fragment`.
  size_t Count(std::string_view fragment) const {
    std::lock_guard<std::mutex> lock(mutex_);
    size_t n = 0;
    for (const auto& l : lines_) n += l.text.find(fragment) != std::string::npos;
    return n;
  }

  void Clear() {
    std::lock_guard<std::mutex> lock(mutex_);
    lines_.clear();
  }

 private:
  int savedThreshold_;
  mutable std::mutex mutex_;
  std::vector<LogLine> lines_;
};

}  // namespace ZyrdTest
