#include "platform/runtime/logger.h"

#include "platform/util/log.h"

namespace Strake::Service {

std::shared_ptr<Logger> Logger::sDefaultLogger = std::make_shared<Logger>("default", 5);

std::shared_ptr<Logger> Logger::CreateLogger(const std::shared_ptr<Logger>& parent,
                                             std::string name) {
  // A new logger starts at the log threshold in force (set from "log/level"),
  // or at its parent's level when logging is off.
  int level = Groundwork::GetLogThreshold();
  if (level == Groundwork::kLogOff && parent) level = parent->Level();
  return std::make_shared<Logger>(std::move(name), level);
}

std::string Formatter::Apply(const std::string& format) const {
  std::string out;
  out.reserve(format.size());
  for (size_t i = 0; i < format.size(); ++i) {
    if (format[i] == '%' && i + 1 < format.size() && format[i + 1] >= '1' &&
        format[i + 1] <= '9') {
      size_t index = static_cast<size_t>(format[i + 1] - '1');
      if (index < args_.size()) {
        out += args_[index];
        ++i;
        continue;
      }
    }
    out.push_back(format[i]);
  }
  return out;
}

void LogInternal(const std::shared_ptr<Logger>& logger, int level, const std::string& format,
                 const Formatter& args) {
  std::string text = args.Apply(format);
  Log_Level(level, "%s: %s\n", logger ? logger->Name().c_str() : "", text.c_str());
}

}  // namespace Strake::Service
