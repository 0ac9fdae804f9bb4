#include "platform/util/log.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <sstream>
#include <thread>

#include "platform/util/panic.h"
#include "tests/support/log_capture.h"

namespace {

TEST(LogLevelNames, MapToThresholds) {
  for (auto [name, level] : {std::pair{"error", 2},
                             {"warning", 3},
                             {"info", 5},
                             {"verbose", 6},
                             {"trivia", 7},
                             {"none", Groundwork::kLogOff},
                             {"4", 4}}) {
    int t = -5;
    ASSERT_TRUE(Groundwork::ParseLogLevel(name, &t)) << name;
    EXPECT_EQ(t, level) << name;
  }
  int t = 99;
  for (const char* bad : {"loud", "8", ""}) EXPECT_FALSE(Groundwork::ParseLogLevel(bad, &t)) << bad;
  EXPECT_EQ(t, 99);
}

TEST(LogThreshold, LevelsZeroAndOnePassWheneverLoggingIsOn) {
  ZyrdTest::LogCapture capture(2);
  EXPECT_TRUE(Log_IsEnabled(0));
  EXPECT_TRUE(Log_IsEnabled(1));
  EXPECT_TRUE(Log_IsEnabled(2));
  EXPECT_FALSE(Log_IsEnabled(3));

  Log_Level(0, "op %d\n", 1);
  Log_Level(3, "dropped\n");
  Log_Level(2, "kept %s\n", "error");
  auto lines = capture.Lines();
  ASSERT_EQ(lines.size(), 2u);
  EXPECT_EQ(lines[0].text, "op 1\n");
  EXPECT_EQ(lines[1].text, "kept error\n");

  Groundwork::SetLogThreshold(Groundwork::kLogOff);
  EXPECT_FALSE(Log_IsEnabled(0));
  Log_Level(0, "silent\n");
  EXPECT_EQ(capture.Lines().size(), 2u);
}

TEST(LogRecords, FormattedLineCarriesPrefixAndOneLineFeedAndIsNeverTruncated) {
  ZyrdTest::LogCapture capture;
  std::string big(5000, 'x');
  Log_Level(5, "%s\n", big.c_str());
  ASSERT_EQ(capture.Lines().size(), 1u);
  EXPECT_EQ(capture.Lines()[0].text, big + "\n");

  Groundwork::SetLogThreadName("tester");
  std::string line = Groundwork::FormatLogLine(3, "hello\n");
  EXPECT_NE(line.find(" zyrd[" + std::to_string(getpid()) + "] warning [tester] hello\n"),
            std::string::npos);
  EXPECT_EQ(line.find('\n'), line.size() - 1);
  EXPECT_EQ(Groundwork::FormatLogLine(5, "no newline").back(), '\n');
  Groundwork::SetLogThreadName("");
}

// Quoted text cannot end a record early: control characters, DEL, bytes
// above ASCII and backslashes are escaped; only the record's own line feed
// stays. A panic is a critical record, not a key operation's.
TEST(LogRecords, QuotedTextStaysOnOneLine) {
  ZyrdTest::LogCapture capture;
  Log_Level(3, "provider %s not found\n", "p1\nFAKE\r\x1b[31m\\x0a\xc3\xa9\x7f");
  ASSERT_EQ(capture.Lines().size(), 1u);
  EXPECT_EQ(capture.Lines()[0].text,
            "provider p1\\x0aFAKE\\x0d\\x1b[31m\\\\x0a\\xc3\\xa9\\x7f not found\n");
  struct LevelToStderr : Groundwork::LogSink {
    void Write(int level, std::string_view text) override {
      fprintf(stderr, "level %d: %.*s", level, static_cast<int>(text.size()), text.data());
    }
  };
  EXPECT_DEATH(
      {
        static LevelToStderr sink;
        Groundwork::SetLogSink(&sink);
        Panic("boom\n");
      },
      "level 1: boom");
}

// Concurrent writers to standard error: every line that arrives is whole.
TEST(LogRecords, ConcurrentStderrLinesDoNotInterleave) {
  int fds[2];
  ASSERT_EQ(pipe(fds), 0);
  int savedStderr = dup(STDERR_FILENO);
  dup2(fds[1], STDERR_FILENO);
  close(fds[1]);

  std::string collected;
  std::thread reader([&] {
    char buf[4096];
    ssize_t n;
    while ((n = read(fds[0], buf, sizeof buf)) > 0) collected.append(buf, static_cast<size_t>(n));
  });
  int saved = Groundwork::GetLogThreshold();
  Groundwork::SetLogThreshold(5);
  std::vector<std::thread> writers;
  for (int t = 0; t < 4; ++t) {
    writers.emplace_back([t] {
      std::string payload(300, static_cast<char>('a' + t));
      for (int i = 0; i < 200; ++i) Log_Level(5, "%s\n", payload.c_str());
    });
  }
  for (auto& w : writers) w.join();
  Groundwork::SetLogThreshold(saved);
  dup2(savedStderr, STDERR_FILENO);
  close(savedStderr);
  reader.join();
  close(fds[0]);

  std::istringstream in(collected);
  size_t lines = 0;
  for (std::string line; std::getline(in, line); ++lines) {
    std::string_view payload = std::string_view(line).substr(line.size() - 300);
    EXPECT_EQ(payload.find_first_not_of(payload[0]), std::string_view::npos) << line;
  }
  EXPECT_EQ(lines, 800u);
  EXPECT_EQ(collected.back(), '\n');
}

// The record reaches standard error even when logging is off.
TEST(PanicDeathTest, VerifyAndNotReachedNameFileWithoutExtensionAndLine) {
  EXPECT_DEATH(VERIFY(1 + 1 == 3), "VERIFY tests/util/log_test:[0-9]+");
  EXPECT_DEATH(NOT_REACHED(), "NOT_REACHED tests/util/log_test:[0-9]+");
  EXPECT_DEATH(
      {
        Groundwork::SetLogThreshold(Groundwork::kLogOff);
        Panic("boom %d\n", 7);
      },
      "boom 7");
}

}  // namespace
