#include "platform/lumo/async_result.h"

#include "platform/lumo/core_messages.h"
#include "platform/util/log.h"
#include "platform/util/panic.h"

namespace Lumo::Core {

struct Completion::State {
  CallPtr call;
  MethodResultCallback done;
  std::atomic<bool> completed{false};

  ~State() {
    if (completed.load(std::memory_order_acquire)) return;
    const char* method = call ? call->method.c_str() : "(unnamed)";
    Log_Level(2, "Operation %s ended without completing its result\n", method);
    done(MethodResult::Error(InternalServerError()));
  }
};

Completion::Completion(CallPtr call, MethodResultCallback done)
    : state_(std::make_shared<State>()) {
  state_->call = std::move(call);
  state_->done = std::move(done);
}

void Completion::Complete(MethodResult result) const {
  if (state_->completed.exchange(true, std::memory_order_acq_rel)) {
    Panic("Operation %s completed its result more than once\n",
          state_->call ? state_->call->method.c_str() : "(unnamed)");
  }
  // Hand the callback its result and release it: whatever it captured (the
  // caller's own completion, the connection) is not kept alive by copies of
  // this completion that someone still holds.
  MethodResultCallback done = std::move(state_->done);
  state_->done = nullptr;
  done(std::move(result));
}

bool Completion::Completed() const { return state_->completed.load(std::memory_order_acquire); }

}  // namespace Lumo::Core
