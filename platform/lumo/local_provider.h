// The innermost stage: dispatches a call to the bound operation its method
// names, through a hash map from full method name built once at
// construction. It also serves the introspection services
// ("com.tarsel.lumo.std.introspection.*") for the operations it holds, under
// the provider name "AsyncLocalProvider".
//
// Immutable after construction; thread-safe.
#pragma once

#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "platform/lumo/bindings.h"
#include "platform/lumo/metadata.h"
#include "platform/lumo/provider.h"

namespace Lumo::Provider {

class AsyncLocalProvider : public ApiProvider {
 public:
  static constexpr const char* kProviderName = "AsyncLocalProvider";

  // `interfaces` are the bound services in the order given. `metamodel`, when
  // not null, describes operations for the introspection service.
  AsyncLocalProvider(Executor executor, std::vector<ApiInterfacePtr> interfaces,
                     std::shared_ptr<const Metadata::Metamodel::MetadataContainer> metamodel);
  AsyncLocalProvider(const AsyncLocalProvider&) = delete;
  AsyncLocalProvider& operator=(const AsyncLocalProvider&) = delete;

  // Runs the bound operation through the executor; an unknown method
  // completes with "com.tarsel.lumo.std.errors.operation_not_found".
  void Invoke(Core::CallPtr call, Core::Completion completion) override;

  // Every service id held (introspection included), in binding order.
  const std::vector<std::string>& ServiceIds() const { return serviceIds_; }
  bool HasOperation(const std::string& method) const { return operations_.count(method) != 0; }

 private:
  void Add(const ApiInterfacePtr& iface);
  std::vector<ApiInterfacePtr> IntrospectionInterfaces();

  Executor executor_;
  std::shared_ptr<const Metadata::Metamodel::MetadataContainer> metamodel_;
  std::vector<ApiInterfacePtr> interfaces_;
  std::vector<std::string> serviceIds_;
  std::unordered_map<std::string, std::vector<std::string>> operationsByService_;
  std::unordered_map<std::string, OperationInvoker> operations_;
  std::string checksum_;
};

}  // namespace Lumo::Provider
