// The store's text forms of objects, on Boost.JSON.
//
// Export text (one line, no white space):
//
//   {"format":"orna-configstore-export","version":1,
//    "scope":[{"key":"providers","group":"kms","component":"orna"}],
//    "objects":[{"key":"providers","group":"kms","component":"orna",
//                "instance":"p1","values":{"master_key_id":"k1","provider":"p1"},
//                "subObjects":[{"name":"key_server","instance":"",
//                               "values":{...},"subObjects":[...]}]}]}
//
// Strings are JSON strings, `long`s JSON integers, lists JSON arrays of
// strings. Objects are ordered by key, group, component and instance,
// values by name, sub-objects by name and, within one name, in their stored
// order (the order of a provider's servers is part of its configuration).
// Equal contents therefore give byte-identical texts.
//
// "scope" lists every key, group and component the text was exported for,
// including those without any instance, so importing the export of an
// empty scope empties it. A text without "scope" covers the keys of its
// objects.
//
// Decoding is strict: anything that is not exactly this shape (another
// format or version, unknown members, a value of another type, an empty
// name, a duplicate object or sub-object, a "provider" value that differs
// from the instance id) is refused with a reason.
//
// The JSON trees built while encoding and decoding, and the texts while they
// are written, live in memory that is overwritten with zeros when released;
// callers wipe the plain texts they get.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/configstore/store_object.h"

namespace OrnaConfigStore::Codec {

inline constexpr std::string_view kExportFormat = "orna-configstore-export";
inline constexpr long kExportVersion = 1;

struct ExportContents {
  // Key, group and component of each covered scope (instance empty), sorted,
  // without duplicates.
  std::vector<ConfigStoreObjectId> scopes;
  // In the text's order.
  std::vector<ConfigStoreObjectPtr> objects;
};

// The export text of `objects` for `scopes` (instances of the scope ids are
// ignored). Throws ConfigStoreException for two objects with one id.
std::string EncodeExport(const std::vector<ConfigStoreObjectId>& scopes,
                         std::vector<ConfigStoreObjectPtr> objects);

// Parses an export text. False, with the reason in `error`, when refused.
bool DecodeExport(std::string_view text, ExportContents& contents, std::string& error);

// One object as it appears in the export's "objects" list.
std::string EncodeObject(const ConfigStoreObject& object);

// The stored form of one object: {"values":{...},"subObjects":[...]}.
std::string EncodeBody(const StoreObject& object);
// Fills the fresh `object` from its stored form; throws ConfigStoreException
// when the text is not a valid body.
void DecodeBody(std::string_view body, StoreObject& object);

}  // namespace OrnaConfigStore::Codec
