// Running one service operation in a test and describing how it completed.
#pragma once

#include <gtest/gtest.h>

#include <boost/json/serialize.hpp>
#include <optional>
#include <string>

#include "platform/lumo/async_result.h"

namespace ZyrdTest {

// Runs `fn(AsyncResult<T>)` and returns how it completed.
template <typename T, typename Fn>
Lumo::Core::MethodResult RunOp(Fn fn) {
  std::optional<Lumo::Core::MethodResult> out;
  fn(Lumo::AsyncResult<T>(
      Lumo::Core::Completion(nullptr, [&](Lumo::Core::MethodResult r) { out = std::move(r); })));
  EXPECT_TRUE(out.has_value());
  return out ? std::move(*out) : Lumo::Core::MethodResult::InvalidParams("not completed");
}

// "output <json>", or "<error name> <message id> <arg>=<value>..." of an error.
inline std::string Describe(const Lumo::Core::MethodResult& r) {
  if (r.IsOutput()) return "output " + boost::json::serialize(r.output);
  std::string out = r.error->Name();
  for (const auto& m : r.error->Messages()) {
    out += " " + m.id;
    for (const auto& a : m.args) out += " " + a.name + "=" + a.value;
  }
  return out;
}

}  // namespace ZyrdTest
