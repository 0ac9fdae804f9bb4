#include "platform/lumo/authn.h"

namespace Lumo::Authn::Filter {

AsyncAuthnFilter::AsyncAuthnFilter(Provider::ApiProviderPtr next,
                                   std::shared_ptr<AuthnHandler> handler)
    : next_(std::move(next)), handler_(std::move(handler)) {}

void AsyncAuthnFilter::Invoke(Core::CallPtr call, Core::Completion completion) {
  if (call->activation.authData != nullptr) {
    next_->Invoke(std::move(call), std::move(completion));
    return;
  }
  // The handler may answer on another thread; the call and the completion
  // travel with its callback.
  const Core::AsyncActivation& activation = call->activation;
  handler_->Authenticate(activation, [next = next_, call, completion](AuthnOutcome outcome) {
    if (outcome.error != nullptr) {
      completion.Complete(Core::MethodResult::Error(std::move(outcome.error)));
      return;
    }
    if (outcome.result != nullptr) call->activation.authData = std::move(outcome.result);
    next->Invoke(call, completion);
  });
}

}  // namespace Lumo::Authn::Filter
