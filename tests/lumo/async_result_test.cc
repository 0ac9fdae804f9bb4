#include "platform/lumo/async_result.h"

#include <gtest/gtest.h>

#include <boost/json/serialize.hpp>
#include <optional>
#include <thread>

#include "platform/lumo/core_messages.h"
#include "tests/support/log_capture.h"

namespace {

using Lumo::Core::Completion;
using Lumo::Core::MethodResult;

struct Pair {
  std::string a;
  int64_t b = 0;
};
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Pair& in) {
  out = {{"a", in.a}, {"b", in.b}};
}

// Copies share one state; completing from another thread delivers once.
TEST(AsyncResultTest, CompletesOnceWithTheRecordAsJson) {
  std::atomic<int> calls{0};
  std::optional<MethodResult> got;
  Lumo::AsyncResult<Pair> result(Completion(nullptr, [&](MethodResult r) {
    ++calls;
    got = std::move(r);
  }));
  std::thread worker([copy = result] { copy.SetResult({"x", 7}); });
  worker.join();
  EXPECT_TRUE(result.Completed());
  ASSERT_EQ(calls.load(), 1);
  EXPECT_EQ(boost::json::serialize(got->output), R"({"a":"x","b":7})");
}

TEST(AsyncResultTest, SecondCompletionStopsTheProcess) {
  EXPECT_DEATH(
      {
        Lumo::AsyncResult<void> result(Completion(nullptr, [](MethodResult) {}));
        result.SetResult();
        result.SetError(Lumo::Core::InternalServerError());
      },
      "completed its result more than once");
}

TEST(AsyncResultTest, DroppedResultAnswersInternalServerErrorAndIsLogged) {
  ZyrdTest::LogCapture log;
  std::optional<MethodResult> got;
  auto call = std::make_shared<Lumo::Core::Call>("svc.op", boost::json::object());
  {
    Lumo::AsyncResult<Pair> result(Completion(call, [&](MethodResult r) { got = std::move(r); }));
    Lumo::AsyncResult<Pair> elsewhere = result;
  }
  ASSERT_TRUE(got.has_value());
  EXPECT_EQ(got->error->Name(), "com.tarsel.lumo.std.errors.internal_server_error");
  EXPECT_TRUE(log.Has(2, "Operation svc.op ended without completing its result\n"));
}

}  // namespace
