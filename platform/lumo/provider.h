// The one interface that every stage of the provider chain offers: take a
// call, then either hand it to the next stage or complete it.
#pragma once

#include <functional>
#include <memory>

#include "platform/lumo/async_result.h"
#include "platform/lumo/call.h"

namespace Lumo {

// Runs a task. The daemon's executor runs each task at once on the calling
// thread.
using Executor = std::function<void(std::function<void()>)>;

}  // namespace Lumo

namespace Lumo::Provider {

class ApiProvider {
 public:
  virtual ~ApiProvider() = default;

  // Handles `call` and completes `completion` exactly once, on any thread,
  // possibly before returning. Implementations are thread-safe: any number of
  // calls may be in flight at once.
  virtual void Invoke(Core::CallPtr call, Core::Completion completion) = 0;
};

using ApiProviderPtr = std::shared_ptr<ApiProvider>;

}  // namespace Lumo::Provider
