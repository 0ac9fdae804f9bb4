// Builders of the API errors that services complete their results with. Every
// builder returns a shared, immutable error value of one standard error class
// carrying the messages passed in (copied) and that class's error type.
#pragma once

#include <string>
#include <vector>

#include "platform/lumo/errors.h"

namespace Zyrd::ZyrApi {

using Messages = std::vector<Lumo::L10n::LocalizableMessage>;

Lumo::Data::ErrorValuePtr MakeError(const Messages& messages);             // Error, type 0
Lumo::Data::ErrorValuePtr MakeNotFoundError(const Messages& messages);     // NotFound, 12
Lumo::Data::ErrorValuePtr MakeInvalidArgumentError(const Messages& messages);  // InvalidArgument, 7
Lumo::Data::ErrorValuePtr MakeUnsupportedError(const Messages& messages);  // Unsupported, 23
Lumo::Data::ErrorValuePtr MakeUnauthenticatedError(const Messages& messages);  // Unauthenticated, 20

// Store status -> error: 1 AlreadyExists and 3 NotFound with `messages`; any
// other status an Error whose only message is
// "com.tarsel.orna.kms.providers.config_store_error" (`messages` unused).
Lumo::Data::ErrorValuePtr MakeConfigStoreError(int status, const Messages& messages);
Lumo::Data::ErrorValuePtr MakeConfigStoreError(int status);

// invalid_argument with "com.tarsel.orna.kms.providers.invalid_argument"
// naming `parameter`.
Lumo::Data::ErrorValuePtr MakeInvalidParameterError(const std::string& parameter);
// not_found with "com.tarsel.orna.kms.providers.not_found" naming `provider`.
Lumo::Data::ErrorValuePtr MakeProviderNotFoundError(const std::string& provider);
// MakeConfigStoreError for a provider's store status: 1 names the provider
// as already existing, 3 as not found; others are config_store_error.
Lumo::Data::ErrorValuePtr MakeProviderStoreError(int status, const std::string& provider);

// The localizer that services convert their messages with: en_US over the
// message catalogue. Built once, shared, thread-safe.
const Lumo::L10n::Localizer& CatalogueLocalizer();

// One catalogue message with named arguments, converted with
// CatalogueLocalizer(): Message("...not_found", {{"provider", p}}).
Lumo::L10n::LocalizableMessage Message(const std::string& id,
                                       const std::vector<Lumo::MsgArgument>& args = {});

}  // namespace Zyrd::ZyrApi
