#include "platform/lumo/localizer.h"

namespace Lumo::L10n {
namespace {

bool IsNameChar(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' ||
         c == '.' || c == '-';
}

}  // namespace

std::string FormatTemplate(const std::string& tmpl, const std::vector<MsgArgument>& args) {
  std::string out;
  out.reserve(tmpl.size() + 32);
  size_t i = 0;
  while (i < tmpl.size()) {
    char c = tmpl[i];
    if (c == '{') {
      size_t end = i + 1;
      while (end < tmpl.size() && IsNameChar(tmpl[end])) ++end;
      if (end < tmpl.size() && tmpl[end] == '}' && end > i + 1) {
        std::string_view name(tmpl.data() + i + 1, end - i - 1);
        const MsgArgument* found = nullptr;
        for (const auto& a : args) {
          if (a.name == name) {
            found = &a;
            break;
          }
        }
        if (found != nullptr) {
          out += found->value;
          i = end + 1;
          continue;
        }
      }
    }
    out.push_back(c);
    ++i;
  }
  return out;
}

namespace LocaleHelpers {
std::vector<std::string> MakeLanguagePreference(std::vector<std::string> locales) {
  return locales;
}
}  // namespace LocaleHelpers

Localizer::Localizer(std::vector<std::string> locales, MessageResolver resolver,
                     TimezoneSpec timezone)
    : locales_(std::move(locales)), resolver_(std::move(resolver)), timezone_(std::move(timezone)) {}

LocalizableMessage Localizer::Localize(const NamedMessageBuilder& builder) const {
  const std::string& locale = locales_.empty() ? std::string() : locales_.front();
  std::string tmpl = resolver_ ? resolver_(builder.Id(), locale) : builder.Id();
  return LocalizableMessage{builder.Id(), FormatTemplate(tmpl, builder.Args()), builder.Args()};
}

namespace LocalizableMessageHelpers {

std::vector<LocalizableMessage> ConvertMessages(const Localizer& localizer,
                                                const std::vector<NamedMessageBuilder>& builders) {
  std::vector<LocalizableMessage> out;
  out.reserve(builders.size());
  for (const auto& b : builders) out.push_back(localizer.Localize(b));
  return out;
}

LocalizableMessage formatMessage(const Localizer& localizer, const NamedMessageBuilder& builder) {
  return localizer.Localize(builder);
}

}  // namespace LocalizableMessageHelpers
}  // namespace Lumo::L10n
