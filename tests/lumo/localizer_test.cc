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

}  // namespace
