#include "platform/lumo/localizer.h"

#include <gtest/gtest.h>

#include "platform/lumo/errors.h"

namespace {

using Lumo::L10n::FormatTemplate;

TEST(FormatTemplate, FillsNamedPlaceholders) {
  EXPECT_EQ(
      FormatTemplate("Key server {server} is {state}.", {{"state", "down"}, {"server", "kmip-1"}}),
      "Key server kmip-1 is down.");
  EXPECT_EQ(FormatTemplate("{a}{a}{b}", {{"a", "x"}, {"b", "y"}}), "xxy");
}

TEST(FormatTemplate, LeavesWhatItCannotFillAsWritten) {
  EXPECT_EQ(FormatTemplate("no {missing} arg", {}), "no {missing} arg");
  EXPECT_EQ(FormatTemplate("open { brace", {{"brace", "x"}}), "open { brace");
  EXPECT_EQ(FormatTemplate("{} empty", {}), "{} empty");
  EXPECT_EQ(FormatTemplate("trailing {", {}), "trailing {");
  EXPECT_EQ(FormatTemplate("{bad name}", {{"bad name", "x"}}), "{bad name}");
}

TEST(FormatTemplate, ArgumentValuesAreNotReexpanded) {
  EXPECT_EQ(FormatTemplate("{p}", {{"p", "{q}"}, {"q", "no"}}), "{q}");
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

TEST(ErrorValues, CarryNameTypeAndMessages) {
  Com::Tarsel::Lumo::Std::Errors::NotFound native;
  native.errorType = Lumo::Data::ErrorType::kNotFound;
  native.messages.push_back({"id", "text", {}});
  Lumo::L10n::Localizer localizer({"en_US"}, nullptr);
  auto value = Lumo::Data::NativeToValueAdapter::Adapt(native, localizer);
  EXPECT_EQ(value->Name(), "com.tarsel.lumo.std.errors.not_found");
  EXPECT_EQ(Lumo::Data::ErrorTypeName(*value->Type()), "NOT_FOUND");
  ASSERT_EQ(value->Messages().size(), 1u);
  EXPECT_EQ(value->Messages()[0].defaultMessage, "text");
}

}  // namespace
