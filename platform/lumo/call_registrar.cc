#include "platform/lumo/call_registrar.h"

namespace Lumo::Observer {

CallRegistrar::CallRegistrar(Provider::ApiProviderPtr next, AuditRecordWriter writer)
    : next_(std::move(next)), writer_(std::move(writer)) {}

void CallRegistrar::Invoke(Core::CallPtr call, Core::Completion completion) {
  AuditAttributes& attrs = call->activation.auditAttributes;
  attrs[kEventId] = kApiCallEvent;
  attrs[kSubject] = "";
  std::string_view service = call->ServiceId();
  if (service.empty()) {
    attrs[kObject] = "";
  } else {
    std::string object(service);
    object += ':';
    object += call->OperationId();
    attrs[kObject] = std::move(object);
  }
  attrs[kResult] = "false";

  Core::Completion observed(call, [call, completion, writer = writer_](Core::MethodResult result) {
    AuditAttributes& attrs = call->activation.auditAttributes;
    if (call->activation.authData != nullptr) attrs[kSubject] = call->activation.authData->username;
    attrs[kResult] = result.IsOutput() ? "true" : "false";
    // The record is written before the answer leaves, so a caller that has
    // its answer can rely on the call being on record.
    writer(attrs);
    completion.Complete(std::move(result));
  });
  next_->Invoke(std::move(call), std::move(observed));
}

}  // namespace Lumo::Observer
