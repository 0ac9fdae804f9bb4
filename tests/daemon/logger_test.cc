#include "daemon/logger.h"

#include <gtest/gtest.h>

#include <cstdarg>

#include "tests/support/log_capture.h"

namespace {

using Zyrd::ZyrApi::LumoLoggerWrapper;

struct Call {
  int level;
  std::string format;
  std::string text;
};
std::vector<Call> gCalls;

void RecordingLog(int level, const char* fmt, ...) {
  va_list args;
  va_start(args, fmt);
  char buf[512];
  vsnprintf(buf, sizeof buf, fmt, args);
  va_end(args);
  gCalls.push_back({level, fmt, buf});
}

TEST(LumoLoggerWrapper, OneCallPerRecordAtTheMappedLevel) {
  const int expected[] = {7, 6, 5, 3, 2, 1};
  for (int level = 0; level <= 5; ++level) {
    EXPECT_EQ(Zyrd::ZyrApi::MapFrameworkLevel(level), expected[level]);
  }
  ZyrdTest::LogCapture threshold(7);
  gCalls.clear();
  LumoLoggerWrapper wrapper(&RecordingLog);
  LUMO_LOG(&wrapper, Lumo::Log::kInfo) << "Listening on: "
                                       << "127.0.0.1:7888";
  LUMO_LOG(&wrapper, Lumo::Log::kDebug) << "Request received"
                                        << "["
                                        << "1.2.3.4"
                                        << "]\n";
  ASSERT_EQ(gCalls.size(), 2u);
  EXPECT_EQ(gCalls[0].level, 5);
  EXPECT_EQ(gCalls[0].format, "%s");
  EXPECT_EQ(gCalls[0].text, "Listening on: 127.0.0.1:7888");
  EXPECT_EQ(gCalls[1].level, 6);
  EXPECT_EQ(gCalls[1].text, "Request received[1.2.3.4]\n");
}

TEST(LumoLoggerWrapper, DisabledLevelBuildsNoRecordAndEvaluatesNothing) {
  ZyrdTest::LogCapture threshold(3);
  gCalls.clear();
  LumoLoggerWrapper wrapper(&RecordingLog);
  EXPECT_EQ(wrapper.CreateRecord(Lumo::Log::kInfo), nullptr);  // maps to 5
  int evaluated = 0;
  auto expensive = [&] {
    ++evaluated;
    return "x";
  };
  LUMO_LOG(&wrapper, Lumo::Log::kTrace) << expensive();
  EXPECT_EQ(evaluated, 0);
  EXPECT_TRUE(gCalls.empty());
  EXPECT_NE(wrapper.CreateRecord(Lumo::Log::kWarning), nullptr);  // maps to 3
}

TEST(LumoLoggerWrapperDeathTest, LevelAboveFiveIsNotReached) {
  LumoLoggerWrapper wrapper(&RecordingLog);
  EXPECT_DEATH(wrapper.CreateRecord(6), "NOT_REACHED daemon/logger:[0-9]+");
}

}  // namespace
