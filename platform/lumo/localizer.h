// The localizer: message identifier -> template (through a resolver), filled
// with the message's named arguments. Only English templates exist; the
// locale preferences are kept for callers that ask for them.
//
// A Localizer is immutable after construction and safe to share across
// threads.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/lumo/messages.h"

namespace Lumo::L10n {

// (message identifier, locale) -> template.
using MessageResolver = std::function<std::string(const std::string& id, const std::string& locale)>;

struct TimezoneSpec {
  std::string name = "Etc/UTC";
};

namespace LocaleHelpers {
// A preference list: the locales in the order given.
std::vector<std::string> MakeLanguagePreference(std::vector<std::string> locales);
}  // namespace LocaleHelpers

class Localizer {
 public:
  // Without a resolver a message's template is its identifier.
  Localizer(std::vector<std::string> locales, MessageResolver resolver,
            TimezoneSpec timezone = {});

  const std::vector<std::string>& Locales() const { return locales_; }
  const TimezoneSpec& Timezone() const { return timezone_; }

  LocalizableMessage Localize(const NamedMessageBuilder& builder) const;

 private:
  std::vector<std::string> locales_;
  MessageResolver resolver_;
  TimezoneSpec timezone_;
};

namespace LocalizableMessageHelpers {

std::vector<LocalizableMessage> ConvertMessages(const Localizer& localizer,
                                                const std::vector<NamedMessageBuilder>& builders);
LocalizableMessage formatMessage(const Localizer& localizer, const NamedMessageBuilder& builder);

}  // namespace LocalizableMessageHelpers
}  // namespace Lumo::L10n
