#include "platform/lumo/localizer.h"

#include <gtest/gtest.h>

#include "platform/lumo/errors.h"

namespace {

using Lumo::L10n::FormatTemplate;

TEST(FormatTemplate, FillsNamedPlaceholdersAndLeavesTheRestAsWritten) {
  const std::tuple<const char*, std::vector<Lumo::MsgArgument>, const char*> cases[] = {
      {"Key server {server} is {state}.",
       {{"state", "down"}, {"server", "kmip-1"}},
       "Key server kmip-1 is down."},
      {"{a}{a}{b}", {{"a", "x"}, {"b", "y"}}, "xxy"},
      {"{p}", {{"p", "{q}"}, {"q", "no"}}, "{q}"},  // values are not re-expanded
      {"no {missing} arg", {}, "no {missing} arg"},
      {"open { brace", {{"brace", "x"}}, "open { brace"},
      {"{} empty", {}, "{} empty"},
      {"trailing {", {}, "trailing {"},
      {"{bad name}", {{"bad name", "x"}}, "{bad name}"},
  };
  for (const auto& [templ, args, expected] : cases) {
    EXPECT_EQ(FormatTemplate(templ, args), expected) << templ;
  }
}

TEST(Localizer, ResolvesThenFormatsAndKeepsArguments) {
  Lumo::L10n::Localizer localizer({"en_US"}, [](const std::string& id, const std::string& locale) {
    EXPECT_EQ(locale, "en_US");
    return id == "greet" ? std::string("Hello {who}.") : std::string("?");
  });
  Lumo::NamedMessageBuilder builder("greet");
  builder.Arg("who", "world").Arg("unused", "x");
  auto msg = localizer.Localize(builder);
  EXPECT_EQ(msg.id, "greet");
  EXPECT_EQ(msg.defaultMessage, "Hello world.");
  ASSERT_EQ(msg.args.size(), 2u);
  EXPECT_EQ(msg.args[1].name, "unused");
}

}  // namespace
