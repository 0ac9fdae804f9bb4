#include "platform/util/panic.h"

#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string>
#include <unordered_map>

#include "platform/util/log.h"

namespace Groundwork {

const char* SourcePathWithoutExtension(const char* file) {
  static std::mutex mu;
  static std::unordered_map<const char*, std::string> cache;
  std::lock_guard<std::mutex> lock(mu);
  auto [it, inserted] = cache.try_emplace(file, file);
  if (inserted) {
    std::string& path = it->second;
    size_t slash = path.rfind('/');
    size_t dot = path.rfind('.');
    if (dot != std::string::npos && (slash == std::string::npos || dot > slash)) {
      path.resize(dot);
    }
  }
  return it->second.c_str();
}

}  // namespace Groundwork

void Panic(const char* fmt, ...) {
  char msg[1024];
  va_list args;
  va_start(args, fmt);
  vsnprintf(msg, sizeof msg, fmt, args);
  va_end(args);

  // The record goes through the normal log path first so that whoever watches
  // the log sees why the process stopped; standard error gets it as well in
  // case the log is off or redirected.
  bool logOff = Groundwork::GetLogThreshold() == Groundwork::kLogOff;
  Log_Level(1, "%s", msg);
  if (!logOff && !Groundwork::HasCustomLogSink()) abort();
  std::string text = msg;
  if (!text.empty() && text.back() == '\n') text.pop_back();
  std::string line = "PANIC: " + Groundwork::EscapeForLog(text) + "\n";
  ssize_t ignored = ::write(STDERR_FILENO, line.data(), line.size());
  (void)ignored;
  abort();
}
