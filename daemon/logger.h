// The daemon's log adapters: the API framework's logger over Log_Level, and
// the runtime logger "zyrdLogger" used by the configuration store layer.
#pragma once

#include <memory>
#include <sstream>
#include <string>

#include "platform/lumo/log.h"
#include "platform/runtime/logger.h"

namespace Zyrd::ZyrApi {

using LogFunction = void (*)(int level, const char* fmt, ...);

// Framework level -> Log_Level level: 0->7, 1->6, 2->5, 3->3, 4->2, 5->1.
// A level above 5 is a programming error and stops the process.
int MapFrameworkLevel(int frameworkLevel);

// Created once at start-up and shared by the API provider, the filters and
// the transport. Thread-safe; each record belongs to one thread.
class LumoLoggerWrapper : public Lumo::Log::Logger {
 public:
  explicit LumoLoggerWrapper(LogFunction log) : log_(log) {}

  // Null when the mapped level is off, so the caller skips formatting.
  std::unique_ptr<Lumo::Log::LogRecord> CreateRecord(int level) override;

  class Record : public Lumo::Log::LogRecord {
   public:
    Record(LogFunction log, int level) : log_(log), level_(level) {}
    // Emits the collected text as one log call (mapped level, "%s", text);
    // the text is passed as collected, with no line feed added.
    ~Record() override;
    std::ostream& Stream() override { return stream_; }

   private:
    LogFunction log_;
    int32_t level_;
    std::ostringstream stream_;
  };

 private:
  LogFunction log_;
};

// The runtime logger "zyrdLogger", created on first use (thread-safe) on the
// runtime's default logger.
std::shared_ptr<Strake::Service::Logger> GetDaemonLogger();

// Reports an exception's text through the daemon logger at level 3 when the
// logger's level is 3 or more. Callers log their own error line first.
void LogToDaemonLogger(const std::string& exceptionText);

}  // namespace Zyrd::ZyrApi
