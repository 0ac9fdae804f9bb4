// Named runtime loggers. A logger carries a current level that callers compare
// before they log; records go to the host log (Log_Level) prefixed with the
// logger's name.
#pragma once

#include <atomic>
#include <memory>
#include <string>
#include <vector>

namespace Strake::Service {

class Logger {
 public:
  Logger(std::string name, int level) : name_(std::move(name)), level_(level) {}
  const std::string& Name() const { return name_; }
  int Level() const { return level_.load(std::memory_order_relaxed); }
  void SetLevel(int level) { level_.store(level, std::memory_order_relaxed); }

  // The process's default logger.
  static std::shared_ptr<Logger> sDefaultLogger;

  static std::shared_ptr<Logger> CreateLogger(const std::shared_ptr<Logger>& parent,
                                              std::string name);

 private:
  std::string name_;
  std::atomic<int> level_;
};

// Positional arguments for LogInternal's "%1".."%9" placeholders.
class Formatter {
 public:
  Formatter() = default;
  explicit Formatter(std::string arg) { args_.push_back(std::move(arg)); }
  Formatter& operator%(std::string arg) {
    args_.push_back(std::move(arg));
    return *this;
  }
  std::string Apply(const std::string& format) const;

 private:
  std::vector<std::string> args_;
};

// Writes `format` with its placeholders filled at `level` through `logger`.
void LogInternal(const std::shared_ptr<Logger>& logger, int level, const std::string& format,
                 const Formatter& args);

}  // namespace Strake::Service
