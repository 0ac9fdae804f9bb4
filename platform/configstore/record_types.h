// The value types of the records whose layout the store knows: the key
// providers ("providers", group "kms", component "orna") with everything
// below them. Import refuses a text that gives one of these values another
// type, since every reader of the record would then fail on it. Values and
// sub-objects of other names, and other records, are not checked.
#pragma once

#include <string>
#include <vector>

#include "platform/configstore/store_object.h"

namespace OrnaConfigStore {

// False, with the first mistyped value named in `error`, when one of
// `objects` holds a known value of another type.
bool CheckRecordTypes(const std::vector<ConfigStoreObjectPtr>& objects, std::string& error);

}  // namespace OrnaConfigStore
