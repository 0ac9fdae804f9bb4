// The audit observer: the outermost stage of the provider chain. For every
// call it keeps the call's audit attributes and, once the call completes,
// hands them to a record writer:
//   "eventID" = "api.call";
//   "subject" = the authenticated caller's username, or "" for none;
//   "object"  = "<service id>:<operation id>", or "" when the call names no
//               service;
//   "result"  = "true" when the call completed with a value, else "false";
// plus whatever attributes inner stages added to the call's activation. The
// four attributes are always present.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>

#include "platform/lumo/provider.h"

namespace Lumo::Observer {

using AuditAttributes = std::map<std::string, std::string>;
// Writes one audit record; called on whatever thread completed the call,
// after the caller has been answered. Must be thread-safe.
using AuditRecordWriter = std::function<void(const AuditAttributes&)>;

class CallRegistrar : public Provider::ApiProvider {
 public:
  static constexpr const char* kEventId = "eventID";
  static constexpr const char* kSubject = "subject";
  static constexpr const char* kObject = "object";
  static constexpr const char* kResult = "result";
  static constexpr const char* kApiCallEvent = "api.call";

  CallRegistrar(Provider::ApiProviderPtr next, AuditRecordWriter writer);

  void Invoke(Core::CallPtr call, Core::Completion completion) override;

 private:
  Provider::ApiProviderPtr next_;
  AuditRecordWriter writer_;
};

}  // namespace Lumo::Observer
