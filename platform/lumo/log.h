// The API framework's logger interface. Framework levels run from 0 (most
// detailed) to 5 (most severe); a logger turns a level into a record, or into
// nothing when that level is off, and the record emits its text when it is
// destroyed.
#pragma once

#include <memory>
#include <ostream>
#include <sstream>
#include <string>
#include <string_view>

namespace Lumo::Log {

enum Level : int {
  kTrace = 0,
  kDebug = 1,
  kInfo = 2,
  kWarning = 3,
  kError = 4,
  kFatal = 5,
};

class LogRecord {
 public:
  virtual ~LogRecord() = default;
  virtual std::ostream& Stream() = 0;
};

class Logger {
 public:
  virtual ~Logger() = default;
  // A record for one message at `level`, or null when the level is off.
  virtual std::unique_ptr<LogRecord> CreateRecord(int level) = 0;
};

}  // namespace Lumo::Log

// Streams one framework log message; the operands are not evaluated when the
// level is off:  LUMO_LOG(logger, ::Lumo::Log::kInfo) << "Listening on: " << ep;
#define LUMO_LOG(logger, level)                                                                    \
  if (auto lumoLogRecord_ = (logger) ? (logger)->CreateRecord(level) : nullptr; !lumoLogRecord_) { \
  } else                                                                                           \
    lumoLogRecord_->Stream()
