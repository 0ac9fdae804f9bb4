#include "daemon/logger.h"

#include "platform/util/log.h"
#include "platform/util/panic.h"

namespace Zyrd::ZyrApi {

int MapFrameworkLevel(int frameworkLevel) {
  static constexpr int kMap[] = {7, 6, 5, 3, 2, 1};
  if (frameworkLevel < 0 || frameworkLevel > 5) NOT_REACHED();
  return kMap[frameworkLevel];
}

std::unique_ptr<Lumo::Log::LogRecord> LumoLoggerWrapper::CreateRecord(int level) {
  int mapped = MapFrameworkLevel(level);
  if (!Log_IsEnabled(mapped)) return nullptr;
  return std::make_unique<Record>(log_, mapped);
}

LumoLoggerWrapper::Record::~Record() {
  std::string text = stream_.str();
  log_(level_, "%s", text.c_str());
}

std::shared_ptr<Strake::Service::Logger> GetDaemonLogger() {
  static const std::shared_ptr<Strake::Service::Logger> logger =
      Strake::Service::Logger::CreateLogger(Strake::Service::Logger::sDefaultLogger, "zyrdLogger");
  return logger;
}

void LogToDaemonLogger(const std::string& exceptionText) {
  auto logger = GetDaemonLogger();
  if (logger->Level() >= 3) {
    Strake::Service::LogInternal(logger, 3, "%1", Strake::Service::Formatter(exceptionText));
  }
}

}  // namespace Zyrd::ZyrApi
