// Authentication: handlers that recognise a caller from the call's security
// context, and the filter that runs one handler in the provider chain.
#pragma once

#include <functional>
#include <memory>

#include "platform/lumo/call.h"
#include "platform/lumo/errors.h"
#include "platform/lumo/log.h"
#include "platform/lumo/provider.h"

namespace Lumo::Authn {

// What a handler decides about a call: exactly one of
//  - `result` set: the caller is authenticated;
//  - `error` set: the caller presented credentials of this handler's kind
//    that are not acceptable, and the call fails with this error;
//  - neither: this handler does not take the call; the next stage may.
struct AuthnOutcome {
  AuthenticationResultPtr result;
  Data::ErrorValuePtr error;
};

using AuthnCallback = std::function<void(AuthnOutcome)>;

class AuthnHandler {
 public:
  virtual ~AuthnHandler() = default;
  // Calls `done` exactly once, possibly before returning; `activation` may
  // not be used once `done` has been called. Thread-safe.
  virtual void Authenticate(const Core::AsyncActivation& activation, AuthnCallback done) = 0;
};

namespace Filter {

// Runs its handler for calls that no outer filter has authenticated yet: an
// authentication result is attached to the call, which goes on; an error
// completes the call; no result lets the call go on unauthenticated. Calls
// already authenticated go on untouched.
class AsyncAuthnFilter : public Provider::ApiProvider {
 public:
  AsyncAuthnFilter(Provider::ApiProviderPtr next, std::shared_ptr<AuthnHandler> handler);

  void Invoke(Core::CallPtr call, Core::Completion completion) override;

 private:
  Provider::ApiProviderPtr next_;
  std::shared_ptr<AuthnHandler> handler_;
};

}  // namespace Filter
}  // namespace Lumo::Authn
