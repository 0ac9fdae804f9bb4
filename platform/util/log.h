// Numeric-level logging for the whole daemon.
//
// Levels: 0 one record per successful key operation, 1 most severe framework
// records, 2 errors, 3 warnings, 4 notices, 5 information, 6 verbose detail,
// 7 trivia. Smaller is more important. The threshold comes from the runtime
// configuration key "log/level"; levels 0 and 1 are written whenever logging
// is on at all.
//
// Every record is formatted completely and handed to the sink in one piece;
// the default sink emits it with a single write(2) to standard error, so lines
// of concurrent threads never interleave. All functions are thread-safe.
//
// A record is one line: whatever text it quotes (a caller's provider name, a
// stored value, a key server's message) is passed through EscapeForLog as
// the record is made, so no text can end the line early and forge a record
// of its own.
#pragma once

#include <cstdarg>
#include <string>
#include <string_view>

// Writes one record at `level`. `fmt` is printf-style and ends in a line feed.
void Log_Level(int level, const char* fmt, ...) __attribute__((format(printf, 2, 3)));
void Log_LevelV(int level, const char* fmt, va_list args);

// Whether a record at `level` would be written.
bool Log_IsEnabled(int level);

namespace Groundwork {

inline constexpr int kLogOff = -1;  // threshold value that silences everything

// Receives formatted records. The text is the record as the caller formatted
// it (normally ending in a line feed); the sink adds any prefix.
class LogSink {
 public:
  virtual ~LogSink() = default;
  virtual void Write(int level, std::string_view text) = 0;
};

// Sets the threshold: records with a level above it are dropped (0 and 1 pass
// whenever the threshold is not kLogOff).
void SetLogThreshold(int threshold);
int GetLogThreshold();

// Maps a "log/level" setting to a threshold: "none"/"off" -> kLogOff,
// "panic"/"critical" 1, "error" 2, "warning" 3, "notice" 4, "info" 5,
// "verbose" 6, "trivia"/"debug" 7, or a decimal 0..7. Returns false (and
// leaves `threshold` alone) for anything else.
bool ParseLogLevel(std::string_view name, int* threshold);

// Replaces the sink; nullptr restores the standard-error sink. The sink must
// outlive its installation.
void SetLogSink(LogSink* sink);
bool HasCustomLogSink();

// Names the calling thread in log prefixes (default: its kernel thread id).
void SetLogThreadName(std::string name);

// `text` with every byte outside printable ASCII (control characters, DEL
// and bytes of 0x80 and above) written as "\xNN" and backslashes doubled,
// so the result is one line of plain text that still shows what was there.
std::string EscapeForLog(std::string_view text);

// Formats one standard-error line: UTC time with milliseconds, "zyrd[pid]",
// the level name, the thread and the text (a line feed is added if missing).
std::string FormatLogLine(int level, std::string_view text);

}  // namespace Groundwork
