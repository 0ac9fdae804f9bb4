// One API call as it travels through the provider chain: the method it names,
// its named inputs, and the call context (security context, authentication
// result, request localizer, audit attributes).
//
// A call is created by the protocol handler and shared by the stages; the
// stages touch it one after the other (each hands it on before the next one
// runs), so it needs no lock of its own.
#pragma once

#include <boost/json/value.hpp>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/lumo/localizer.h"
#include "platform/util/secure_buffer.h"

namespace Lumo::Authn {

// What an authentication handler reports for an accepted caller.
struct AuthenticationResult {
  std::string name;                       // the result's structure name, e.g. "KmsAuthentication"
  Groundwork::SecureString accessToken;   // the token as received
  std::string username;                   // the caller's identity ("<ATTEST>", "root")
  std::vector<std::string> entitlements;  // granted entitlements ("@ORNA+KMS_ADMIN")
};

using AuthenticationResultPtr = std::shared_ptr<const AuthenticationResult>;

}  // namespace Lumo::Authn

namespace Lumo::Core {

// The call's security context. The only scheme carried is OAuth with a bearer
// access token (from "Authorization: Bearer <token>"); `scheme` is empty when
// the request carried none.
struct SecurityContext {
  static constexpr std::string_view kOAuthScheme = "com.tarsel.lumo.std.security.oauth";

  std::string_view scheme;
  Groundwork::SecureString accessToken;
};

// Reads a security context as an OAuth context: valid when the scheme is OAuth
// and the access token is not empty.
class OAuthSecurityContextReader {
 public:
  explicit OAuthSecurityContextReader(const SecurityContext& context) : context_(context) {}
  bool IsValid() const {
    return context_.scheme == SecurityContext::kOAuthScheme && !context_.accessToken.empty();
  }
  std::string_view accessToken() const { return context_.accessToken.view(); }

 private:
  const SecurityContext& context_;
};

struct AsyncActivation {
  SecurityContext securityContext;
  // Set by the authentication filter that accepted the caller; null while the
  // call is unauthenticated.
  Authn::AuthenticationResultPtr authData;
  // The localizer for the caller's language; never null once the protocol
  // handler has built the call.
  std::shared_ptr<const L10n::Localizer> requestLocalizer;
  // Attributes of the call's audit record, in key order.
  std::map<std::string, std::string> auditAttributes;
  // The operation id the operation-id stage gave the call; empty before it.
  std::string operationId;
};

struct Call {
  // "<service id>.<operation id>", e.g.
  // "com.tarsel.orna.kms.key_operation.generate_key".
  std::string method;
  // The named inputs: always an object.
  boost::json::value input;
  AsyncActivation activation;

  Call(std::string methodName, boost::json::value inputs)
      : method(std::move(methodName)), input(std::move(inputs)) {
    if (!input.is_object()) input.emplace_object();
  }

  // Text before the last '.'; empty when the method names no service.
  std::string_view ServiceId() const {
    size_t dot = method.rfind('.');
    return dot == std::string::npos ? std::string_view() : std::string_view(method).substr(0, dot);
  }
  // Text after the last '.' (the whole method when it has no '.').
  std::string_view OperationId() const {
    size_t dot = method.rfind('.');
    return dot == std::string::npos ? std::string_view(method)
                                    : std::string_view(method).substr(dot + 1);
  }
};

using CallPtr = std::shared_ptr<Call>;

}  // namespace Lumo::Core
