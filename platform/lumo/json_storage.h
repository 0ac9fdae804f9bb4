// JSON helpers of the API framework: the wiping storage that trees holding
// secrets use (platform/util/wiping_json.h), and the wire form of
// localisable messages.
#pragma once

#include <boost/json/array.hpp>
#include <vector>

#include "platform/lumo/messages.h"
#include "platform/util/wiping_json.h"

namespace Lumo::Data {

// The wire form of localisable messages:
// [{"id":...,"defaultMessage":...,"args":{"name":"value",...}}, ...].
boost::json::array MessagesToJson(const std::vector<L10n::LocalizableMessage>& messages);

}  // namespace Lumo::Data
