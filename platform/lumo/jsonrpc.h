// The JSON-RPC 2.0 protocol handler: turns the body of an HTTP call into a
// call on the API provider and the call's result into the response body.
//
// Request:  {"jsonrpc":"2.0","id":ID,"method":"<service>.<operation>","params":{...}}
// Success:  {"jsonrpc":"2.0","id":ID,"result":{"output":VALUE}}
// Error:    {"jsonrpc":"2.0","id":ID,"result":{"error":{"name":...,"errorType":...,
//            "messages":[{"id":...,"defaultMessage":...,"args":{...}}]}}}
//           with HttpCallResult::errorName set to the error's name.
// A body that is not a JSON-RPC request gets the JSON-RPC "error" member:
// -32700 (not JSON), -32600 (not a request), -32602 (inputs that do not fit
// the operation). With the direct response form (response code 2 or 32) the
// result carries the output itself instead of {"output": ...}.
#pragma once

#include <memory>

#include "platform/lumo/log.h"
#include "platform/lumo/provider.h"
#include "platform/lumo/transport_call.h"

namespace Lumo::Protocol {

// The returned handler is thread-safe and keeps the provider, the localizer
// and the logger alive. It wipes the call's body and authorization header
// once it has taken what it needs from them, since they may carry secrets.
Transport::HttpCallHandler MakeJsonRpcHandler(Provider::ApiProviderPtr provider,
                                              std::shared_ptr<const L10n::Localizer> localizer,
                                              std::shared_ptr<Log::Logger> logger);

// The JSON-RPC error codes used.
inline constexpr int kParseError = -32700;
inline constexpr int kInvalidRequest = -32600;
inline constexpr int kInvalidParams = -32602;

}  // namespace Lumo::Protocol
