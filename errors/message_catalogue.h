// The catalogue of message identifiers the daemon raises, with their default
// English templates. Placeholders are argument names in braces.
#pragma once

#include <array>
#include <string>
#include <string_view>

namespace Zyrd::ZyrApi {

struct CatalogueEntry {
  std::string_view id;
  std::string_view text;
};

extern const std::array<CatalogueEntry, 38> kMessageCatalogue;

// The template of `id` (the locale is ignored: every template is English).
// An identifier outside the catalogue is a programming error and stops the
// process.
std::string ResolveMessage(const std::string& id, const std::string& locale);

}  // namespace Zyrd::ZyrApi
