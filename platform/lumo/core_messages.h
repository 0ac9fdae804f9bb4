// The framework's own messages and the standard errors it raises itself
// (unknown operation, authentication and authorisation refusals, internal
// failures, metadata lookups). Their identifiers live in the framework's
// table, not in the daemon's catalogue, and their text is English.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/lumo/errors.h"
#include "platform/lumo/messages.h"

namespace Lumo::CoreMessages {

inline constexpr const char* kOperationNotFound = "lumo.provider.operation.not.found";
inline constexpr const char* kUnauthenticated = "lumo.authn.unauthenticated";
inline constexpr const char* kUnauthorized = "lumo.authz.unauthorized";
inline constexpr const char* kInternalServerError = "lumo.internal.server.error";
inline constexpr const char* kMetadataLoadFailed = "lumo.metadata.load.failed";
inline constexpr const char* kMetadataNotFound = "lumo.metadata.not.found";

// The message `id` of the framework's table with its placeholders filled.
// An identifier outside the table is a programming error.
L10n::LocalizableMessage Make(std::string_view id, const std::vector<MsgArgument>& args = {});

}  // namespace Lumo::CoreMessages

namespace Lumo::Core {

// "com.tarsel.lumo.std.errors.internal_server_error".
Data::ErrorValuePtr InternalServerError();
// "com.tarsel.lumo.std.errors.operation_not_found" naming the method.
Data::ErrorValuePtr OperationNotFoundError(std::string_view method);
Data::ErrorValuePtr UnauthenticatedError();
Data::ErrorValuePtr UnauthorizedError(std::string_view method);
// "com.tarsel.lumo.std.errors.not_found": `what` (e.g. "service") `id` is not
// in the metadata.
Data::ErrorValuePtr MetadataNotFoundError(std::string_view what, std::string_view id);

}  // namespace Lumo::Core
