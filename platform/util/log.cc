#include "platform/util/log.h"

#include <sys/syscall.h>
#include <pthread.h>
#include <unistd.h>

#include <atomic>
#include <charconv>
#include <cstdio>
#include <ctime>
#include <vector>

#include "platform/util/hostinfo.h"

namespace Groundwork {
namespace {

std::atomic<int> gThreshold{5};
std::atomic<LogSink*> gSink{nullptr};
thread_local std::string tThreadName;

// The process id, read once (a system call per line adds up); a forked child
// reads its own.
std::atomic<pid_t> gPid{0};

pid_t CachedPid() {
  pid_t pid = gPid.load(std::memory_order_relaxed);
  if (pid == 0) {
    static const bool registered = [] {
      return pthread_atfork(nullptr, nullptr, [] { gPid.store(0); }) == 0;
    }();
    (void)registered;
    pid = getpid();
    gPid.store(pid, std::memory_order_relaxed);
  }
  return pid;
}

const char* LevelName(int level) {
  static const char* const kNames[] = {"op",     "crit", "error",   "warning",
                                       "notice", "info", "verbose", "trivia"};
  return level >= 0 && level < 8 ? kNames[level] : "?";
}

void WriteAll(int fd, std::string_view data) {
  while (!data.empty()) {
    ssize_t n = ::write(fd, data.data(), data.size());
    if (n < 0) {
      if (errno == EINTR) continue;
      return;
    }
    data.remove_prefix(static_cast<size_t>(n));
  }
}

}  // namespace

void SetLogThreshold(int threshold) { gThreshold.store(threshold, std::memory_order_relaxed); }
int GetLogThreshold() { return gThreshold.load(std::memory_order_relaxed); }

bool ParseLogLevel(std::string_view name, int* threshold) {
  struct Entry {
    std::string_view name;
    int level;
  };
  static constexpr Entry kLevels[] = {
      {"none", kLogOff}, {"off", kLogOff},   {"panic", 1},   {"critical", 1},
      {"error", 2},      {"warning", 3},     {"notice", 4},  {"info", 5},
      {"verbose", 6},    {"trivia", 7},      {"debug", 7},
  };
  for (const auto& e : kLevels) {
    if (e.name == name) {
      *threshold = e.level;
      return true;
    }
  }
  int value = 0;
  auto [end, ec] = std::from_chars(name.data(), name.data() + name.size(), value);
  if (ec != std::errc() || end != name.data() + name.size() || value < 0 || value > 7) {
    return false;
  }
  *threshold = value;
  return true;
}

void SetLogSink(LogSink* sink) { gSink.store(sink, std::memory_order_release); }
bool HasCustomLogSink() { return gSink.load(std::memory_order_acquire) != nullptr; }

void SetLogThreadName(std::string name) { tThreadName = std::move(name); }

std::string EscapeForLog(std::string_view text) {
  static constexpr char kHex[] = "0123456789abcdef";
  std::string out;
  out.reserve(text.size());
  for (char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    if (c == '\\') {
      out += "\\\\";
    } else if (byte < 0x20 || byte >= 0x7f) {
      out += "\\x";
      out.push_back(kHex[byte >> 4]);
      out.push_back(kHex[byte & 0xf]);
    } else {
      out.push_back(c);
    }
  }
  return out;
}

std::string FormatLogLine(int level, std::string_view text) {
  std::string stamp = FormatUtcMillis(Hostinfo_GetTimeOfDay());
  std::string thread = tThreadName;
  if (thread.empty()) thread = std::to_string(static_cast<long>(syscall(SYS_gettid)));

  std::string line;
  line.reserve(text.size() + 64);
  line.append(stamp).append(" zyrd[").append(std::to_string(CachedPid())).append("] ");
  line.append(LevelName(level)).append(" [").append(thread).append("] ");
  line.append(text);
  if (line.back() != '\n') line.push_back('\n');
  return line;
}

}  // namespace Groundwork

bool Log_IsEnabled(int level) {
  int threshold = Groundwork::GetLogThreshold();
  if (threshold == Groundwork::kLogOff) return false;
  return level <= 1 || level <= threshold;
}

void Log_LevelV(int level, const char* fmt, va_list args) {
  if (!Log_IsEnabled(level)) return;
  char small[512];
  va_list copy;
  va_copy(copy, args);
  int n = vsnprintf(small, sizeof small, fmt, copy);
  va_end(copy);
  if (n < 0) return;
  std::string text;
  if (static_cast<size_t>(n) < sizeof small) {
    text.assign(small, static_cast<size_t>(n));
  } else {
    text.resize(static_cast<size_t>(n) + 1);
    vsnprintf(text.data(), text.size(), fmt, args);
    text.resize(static_cast<size_t>(n));
  }
  // One record, one line: the line feed that ends it stays, everything else
  // is escaped.
  const bool lineEnd = !text.empty() && text.back() == '\n';
  if (lineEnd) text.pop_back();
  text = Groundwork::EscapeForLog(text);
  if (lineEnd) text.push_back('\n');
  if (auto* sink = Groundwork::gSink.load(std::memory_order_acquire)) {
    sink->Write(level, text);
  } else {
    Groundwork::WriteAll(STDERR_FILENO, Groundwork::FormatLogLine(level, text));
  }
}

void Log_Level(int level, const char* fmt, ...) {
  va_list args;
  va_start(args, fmt);
  Log_LevelV(level, fmt, args);
  va_end(args);
}
