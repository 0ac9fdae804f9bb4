#include "platform/lumo/bindings.h"

#include <gtest/gtest.h>

#include <boost/json/parse.hpp>
#include <optional>

namespace {

using Lumo::Bindings::ObjectReader;
using Lumo::Core::MethodResult;

struct Inner {
  std::string type;
  std::optional<int64_t> port;
};
Inner tag_invoke(boost::json::value_to_tag<Inner>, const boost::json::value& v) {
  ObjectReader r(v);
  Inner out{r.String("type"), r.OptionalInt64("port")};
  r.Finish();
  return out;
}

struct Outer {
  std::string name;
  std::vector<Inner> items;
  std::optional<Inner> extra;
  std::optional<bool> flag;
};
Outer tag_invoke(boost::json::value_to_tag<Outer>, const boost::json::value& v) {
  ObjectReader r(v);
  Outer out{r.String("name"), r.List<Inner>("items"), r.OptionalStruct<Inner>("extra"),
            r.OptionalBool("flag")};
  r.Finish();
  return out;
}

// Decodes `json` through an operation bound with input `In`; returns the
// invalid-params detail, or "ok" when the operation ran.
template <typename In = Outer>
std::string Decode(const char* json, In* decoded = nullptr) {
  auto op = Lumo::Provider::BindOperation<In, int64_t>(
      "op", [&](In in, Lumo::AsyncResult<int64_t> result, const Lumo::Core::AsyncActivation&) {
        if (decoded) *decoded = in;
        result.SetResult(1);
      });
  auto call = std::make_shared<Lumo::Core::Call>("svc.op", boost::json::parse(json));
  std::string out;
  op.invoke(call, Lumo::Core::Completion(call, [&](MethodResult r) {
              out = r.kind == MethodResult::Kind::kInvalidParams ? r.detail : "ok";
            }));
  return out;
}

TEST(BindingsTest, DecodesNestedRecordsAndOptionalFields) {
  Outer got;
  EXPECT_EQ(Decode(R"({"name":"n","items":[{"type":"KMIP","port":5696}],"extra":null})", &got),
            "ok");
  EXPECT_EQ(got.name, "n");
  ASSERT_EQ(got.items.size(), 1u);
  EXPECT_EQ(*got.items[0].port, 5696);
  EXPECT_FALSE(got.extra.has_value());
  EXPECT_FALSE(got.flag.has_value());
}

TEST(BindingsTest, BadInputsNameTheFieldAndNeverReachTheOperation) {
  EXPECT_EQ(Decode(R"({"items":[]})"), "field 'name': missing");
  EXPECT_EQ(Decode(R"({"name":5,"items":[]})"), "field 'name': expected a string");
  EXPECT_EQ(Decode(R"({"name":"n","items":{}})"), "field 'items': expected a list");
  EXPECT_EQ(Decode(R"({"name":"n","items":[{"type":1}]})"),
            "field 'items.type': expected a string");
  EXPECT_EQ(Decode(R"({"name":"n","items":[],"extra":{"type":"t","port":1.5}})"),
            "field 'extra.port': expected an integer");
  EXPECT_EQ(Decode(R"({"name":"n","items":[],"extra":{"type":"t","port":18446744073709551615}})"),
            "field 'extra.port': integer out of range");
  EXPECT_EQ(Decode(R"({"name":"n","items":[],"flag":"yes"})"),
            "field 'flag': expected true or false");
  EXPECT_EQ(Decode(R"({"name":"n","items":[],"nmae":"typo"})"), "field 'nmae': unknown field");
  EXPECT_EQ(Decode(R"({"name":"n","items":[{"type":"t","x":1}]})"),
            "field 'items.x': unknown field");
}

TEST(BindingsTest, OperationWithoutInputsRefusesAnyField) {
  EXPECT_EQ(Decode<Lumo::Bindings::NoInput>("{}"), "ok");
  EXPECT_NE(Decode<Lumo::Bindings::NoInput>(R"({"x":1})"), "ok");
}

}  // namespace
