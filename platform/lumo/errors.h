// The framework's standard errors and the immutable error values that travel
// back to callers.
//
// A native error (Com::Tarsel::Lumo::Std::Errors::*) is what a service builds:
// messages, optional extra data, optional error type. NativeToValueAdapter
// turns it into an ErrorValue, which is shared and never changed afterwards.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/lumo/localizer.h"
#include "platform/lumo/messages.h"

namespace Lumo::Data {

// The standard error-type enumeration (wire names in ErrorTypeName).
enum class ErrorType : int {
  kError = 0,
  kAlreadyExists = 1,
  kInternalServerError = 6,
  kInvalidArgument = 7,
  kNotFound = 12,
  kOperationNotFound = 13,
  kUnauthenticated = 20,
  kUnauthorized = 21,
  kUnsupported = 23,
};

// "NOT_FOUND", "INVALID_ARGUMENT", ...
std::string_view ErrorTypeName(ErrorType type);

// An error as it reaches the caller: the standard error's name
// ("com.tarsel.lumo.std.errors.not_found"), its error type and its messages.
class ErrorValue {
 public:
  ErrorValue(std::string name, std::optional<ErrorType> type,
             std::vector<L10n::LocalizableMessage> messages)
      : name_(std::move(name)), type_(type), messages_(std::move(messages)) {}

  const std::string& Name() const { return name_; }
  const std::optional<ErrorType>& Type() const { return type_; }
  const std::vector<L10n::LocalizableMessage>& Messages() const { return messages_; }

 private:
  std::string name_;
  std::optional<ErrorType> type_;
  std::vector<L10n::LocalizableMessage> messages_;
};

using ErrorValuePtr = std::shared_ptr<const ErrorValue>;

}  // namespace Lumo::Data

namespace Com::Tarsel::Lumo::Std::Errors {

using ::Lumo::Data::ErrorType;
using ::Lumo::L10n::LocalizableMessage;

// Common shape of the standard error structures. Extra data is never used by
// this daemon and is not modelled beyond its absence.
struct ErrorBase {
  std::vector<LocalizableMessage> messages;
  std::optional<ErrorType> errorType;
};

#define ZYRD_LUMO_STD_ERROR(Class, wireName, type)                              \
  struct Class : ErrorBase {                                                    \
    static constexpr const char* kName = "com.tarsel.lumo.std.errors." wireName; \
    static constexpr ErrorType kType = type;                                    \
  };

ZYRD_LUMO_STD_ERROR(Error, "error", ErrorType::kError)
ZYRD_LUMO_STD_ERROR(AlreadyExists, "already_exists", ErrorType::kAlreadyExists)
ZYRD_LUMO_STD_ERROR(InternalServerError, "internal_server_error", ErrorType::kInternalServerError)
ZYRD_LUMO_STD_ERROR(InvalidArgument, "invalid_argument", ErrorType::kInvalidArgument)
ZYRD_LUMO_STD_ERROR(NotFound, "not_found", ErrorType::kNotFound)
ZYRD_LUMO_STD_ERROR(OperationNotFound, "operation_not_found", ErrorType::kOperationNotFound)
ZYRD_LUMO_STD_ERROR(Unauthenticated, "unauthenticated", ErrorType::kUnauthenticated)
ZYRD_LUMO_STD_ERROR(Unauthorized, "unauthorized", ErrorType::kUnauthorized)
ZYRD_LUMO_STD_ERROR(Unsupported, "unsupported", ErrorType::kUnsupported)

#undef ZYRD_LUMO_STD_ERROR

}  // namespace Com::Tarsel::Lumo::Std::Errors

namespace Lumo::Data::NativeToValueAdapter {

// Turns a native standard error into a shared error value. The localizer is
// the one the messages were made with; they are carried as they are.
template <typename NativeError>
ErrorValuePtr Adapt(const NativeError& native, const L10n::Localizer& /*localizer*/) {
  return std::make_shared<const ErrorValue>(NativeError::kName, native.errorType, native.messages);
}

}  // namespace Lumo::Data::NativeToValueAdapter
