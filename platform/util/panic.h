// Fatal stops for states the program must never reach.
//
// Panic writes its message as one log record (whatever the log threshold) and
// to standard error, then aborts the process. VERIFY and NOT_REACHED name the
// source file relative to the source root, without its extension, and the
// line: "VERIFY daemon/logger:42".
#pragma once

[[noreturn]] void Panic(const char* fmt, ...) __attribute__((format(printf, 1, 2)));

namespace Groundwork {
// "daemon/logger.cc" -> "daemon/logger" (static storage, cached per call site).
const char* SourcePathWithoutExtension(const char* file);
}  // namespace Groundwork

#define VERIFY(cond)                                                                     \
  do {                                                                                   \
    if (__builtin_expect(!(cond), 0)) {                                                  \
      Panic("VERIFY %s:%d\n", ::Groundwork::SourcePathWithoutExtension(__FILE__), __LINE__); \
    }                                                                                    \
  } while (0)

#define NOT_REACHED() \
  Panic("NOT_REACHED %s:%d\n", ::Groundwork::SourcePathWithoutExtension(__FILE__), __LINE__)
