// The operation-id stage of the provider chain: gives every call a
// process-unique operation id ("op-1", "op-2", ...), kept in the call's
// activation and in its audit attributes ("opId"), so one call can be
// followed from the audit log into the daemon log. Thread-safe.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

#include "platform/lumo/provider.h"

namespace Kestrel::Common::StrakeLumo {

class OpIdProvider : public Lumo::Provider::ApiProvider {
 public:
  static constexpr const char* kAuditAttribute = "opId";

  explicit OpIdProvider(Lumo::Provider::ApiProviderPtr next);

  void Invoke(Lumo::Core::CallPtr call, Lumo::Core::Completion completion) override;

 private:
  Lumo::Provider::ApiProviderPtr next_;
  std::atomic<uint64_t> next_id_{1};
};

}  // namespace Kestrel::Common::StrakeLumo
