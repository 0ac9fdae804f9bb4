// JSON trees that may hold secrets (request parameters such as credentials
// and private keys, results such as data keys) are allocated from a memory
// resource that overwrites every block before it returns it to the heap, so
// no copy of a secret survives in freed memory.
#pragma once

#include <boost/json/serializer.hpp>
#include <boost/json/storage_ptr.hpp>
#include <boost/json/value.hpp>
#include <string>
#include <vector>

#include "platform/lumo/messages.h"

namespace Lumo::Data {

// The process-wide wiping resource (stateless, thread-safe).
boost::json::storage_ptr WipingStorage();

// Serializes `value` into a string. Whenever the output buffer has to grow,
// the old buffer is wiped before it is released, so the only copy of the text
// is the returned string.
std::string SerializeWiping(const boost::json::value& value);

// The wire form of localisable messages:
// [{"id":...,"defaultMessage":...,"args":{"name":"value",...}}, ...].
boost::json::array MessagesToJson(const std::vector<L10n::LocalizableMessage>& messages);

}  // namespace Lumo::Data
