// Command texts and what they ask the server for:
//   "Query, Versions"                     Discover Versions
//   "Get, Object, Id=ID"                  Get, key material in Raw format
//   "Get, Attributes, Id=ID[, Names=N]"   Get Attributes (N: one name or {A, B})
// Each may end with ", Options={Authentication={User=U, Password=P}}", which
// puts a Username and Password credential into the request header. Values
// may be printf conversions filled from a ValueSource (item_list.h). Pure.
#pragma once

#include <string>
#include <string_view>

#include "platform/kmip/item_list.h"
#include "platform/kmip/messages.h"

namespace Qlc {

// Parses `text` into `out` (its version fields are left alone). False with
// `error` set (naming items, never values) when it is not a command above.
bool ParseCommand(std::string_view text, ValueSource* source, Request* out, std::string* error);

}  // namespace Qlc
