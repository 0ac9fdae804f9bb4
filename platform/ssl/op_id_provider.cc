#include "platform/ssl/op_id_provider.h"

namespace Kestrel::Common::StrakeLumo {

OpIdProvider::OpIdProvider(Lumo::Provider::ApiProviderPtr next) : next_(std::move(next)) {}

void OpIdProvider::Invoke(Lumo::Core::CallPtr call, Lumo::Core::Completion completion) {
  uint64_t id = next_id_.fetch_add(1, std::memory_order_relaxed);
  call->activation.operationId = "op-" + std::to_string(id);
  call->activation.auditAttributes[kAuditAttribute] = call->activation.operationId;
  next_->Invoke(std::move(call), std::move(completion));
}

}  // namespace Kestrel::Common::StrakeLumo
