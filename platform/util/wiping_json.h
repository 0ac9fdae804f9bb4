// JSON trees that may hold secrets (request parameters such as credentials
// and private keys, results such as data keys, stored configuration) are
// allocated from a memory resource that overwrites every block before it
// returns it to the heap, so no copy of a secret survives in freed memory.
#pragma once

#include <boost/json/serializer.hpp>
#include <boost/json/storage_ptr.hpp>
#include <boost/json/value.hpp>
#include <string>

namespace Groundwork {

// The process-wide wiping resource (stateless, thread-safe). Pass it to
// boost::json::parse as the result's storage (a parser's constructor takes
// only its scratch storage).
boost::json::storage_ptr WipingJsonStorage();

// Serializes `value` into a string. Whenever the output buffer has to grow,
// the old buffer is wiped before it is released, so the only copy of the text
// is the returned string.
std::string SerializeWiping(const boost::json::value& value);

}  // namespace Groundwork
