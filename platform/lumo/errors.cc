#include "platform/lumo/errors.h"

namespace Lumo::Data {

std::string_view ErrorTypeName(ErrorType type) {
  switch (type) {
    case ErrorType::kError: return "ERROR";
    case ErrorType::kAlreadyExists: return "ALREADY_EXISTS";
    case ErrorType::kInternalServerError: return "INTERNAL_SERVER_ERROR";
    case ErrorType::kInvalidArgument: return "INVALID_ARGUMENT";
    case ErrorType::kNotFound: return "NOT_FOUND";
    case ErrorType::kOperationNotFound: return "OPERATION_NOT_FOUND";
    case ErrorType::kUnauthenticated: return "UNAUTHENTICATED";
    case ErrorType::kUnauthorized: return "UNAUTHORIZED";
    case ErrorType::kUnsupported: return "UNSUPPORTED";
  }
  return "ERROR";
}

}  // namespace Lumo::Data
