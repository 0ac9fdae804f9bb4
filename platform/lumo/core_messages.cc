#include "platform/lumo/core_messages.h"

#include <array>
#include <memory>
#include <utility>

#include "platform/util/panic.h"

namespace Lumo::CoreMessages {
namespace {

constexpr std::array<std::pair<std::string_view, std::string_view>, 6> kTable = {{
    {kOperationNotFound, "The operation '{method}' does not exist."},
    {kUnauthenticated, "Authentication required."},
    {kUnauthorized, "Not authorized to call '{method}'."},
    {kInternalServerError, "An internal error occurred while handling the request."},
    {kMetadataLoadFailed, "Unable to load metadata from {file}: {reason}"},
    {kMetadataNotFound, "The {what} '{id}' does not exist."},
}};

}  // namespace

L10n::LocalizableMessage Make(std::string_view id, const std::vector<MsgArgument>& args) {
  for (const auto& [entryId, text] : kTable) {
    if (entryId == id) {
      return {std::string(id), L10n::FormatTemplate(std::string(text), args), args};
    }
  }
  NOT_REACHED();
}

}  // namespace Lumo::CoreMessages

namespace Lumo::Core {
namespace {

namespace StdErrors = Com::Tarsel::Lumo::Std::Errors;

template <typename NativeError>
Data::ErrorValuePtr Build(std::vector<L10n::LocalizableMessage> messages) {
  return std::make_shared<const Data::ErrorValue>(NativeError::kName, NativeError::kType,
                                                  std::move(messages));
}

}  // namespace

Data::ErrorValuePtr InternalServerError() {
  static const Data::ErrorValuePtr error = Build<StdErrors::InternalServerError>(
      {CoreMessages::Make(CoreMessages::kInternalServerError)});
  return error;
}

Data::ErrorValuePtr OperationNotFoundError(std::string_view method) {
  return Build<StdErrors::OperationNotFound>(
      {CoreMessages::Make(CoreMessages::kOperationNotFound, {{"method", std::string(method)}})});
}

Data::ErrorValuePtr UnauthenticatedError() {
  static const Data::ErrorValuePtr error =
      Build<StdErrors::Unauthenticated>({CoreMessages::Make(CoreMessages::kUnauthenticated)});
  return error;
}

Data::ErrorValuePtr UnauthorizedError(std::string_view method) {
  return Build<StdErrors::Unauthorized>(
      {CoreMessages::Make(CoreMessages::kUnauthorized, {{"method", std::string(method)}})});
}

Data::ErrorValuePtr MetadataNotFoundError(std::string_view what, std::string_view id) {
  return Build<StdErrors::NotFound>({CoreMessages::Make(
      CoreMessages::kMetadataNotFound, {{"what", std::string(what)}, {"id", std::string(id)}})});
}

}  // namespace Lumo::Core
