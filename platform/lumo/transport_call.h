// The boundary between the HTTP transport and the JSON-RPC protocol handler:
// one accepted HTTP request whose body is a JSON-RPC call, and the serialized
// answer that goes back into the HTTP response.
#pragma once

#include <functional>
#include <memory>
#include <string>

namespace Lumo::Transport {

struct HttpCall {
  std::string peer;            // remote endpoint, "127.0.0.1:53412" or "[::1]:53412"
  std::string authorization;   // raw "authorization" header value; empty when absent
  std::string acceptLanguage;  // raw "accept-language" header value; empty when absent
  // Response content-type code chosen from the "accept" header: 1 (JSON-RPC
  // wrapped output) or 2, 16, 32 (see the transport); decides the serializer.
  int responseCode = 1;
  std::string body;  // the complete request body
};

struct HttpCallResult {
  std::string body;       // the serialized JSON-RPC response
  std::string errorName;  // value of the "lumo-error" header; empty when the call succeeded
};

// Handles one call and completes `done` exactly once, on any thread, possibly
// before returning.
using HttpCallHandler =
    std::function<void(std::shared_ptr<HttpCall> call, std::function<void(HttpCallResult)> done)>;

}  // namespace Lumo::Transport
