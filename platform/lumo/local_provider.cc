#include "platform/lumo/local_provider.h"

#include <openssl/evp.h>

#include "platform/lumo/core_messages.h"
#include "platform/util/hex.h"
#include "platform/util/panic.h"

namespace Lumo::Provider {
namespace {

using Args = std::vector<std::optional<std::string>>;
using Core::MethodResult;

constexpr std::string_view kIntrospection = "com.tarsel.lumo.std.introspection.";

boost::json::array Strings(const std::vector<std::string>& items) {
  boost::json::array out;
  out.reserve(items.size());
  for (const auto& s : items) out.emplace_back(s);
  return out;
}

}  // namespace

AsyncLocalProvider::AsyncLocalProvider(
    Executor executor, std::vector<ApiInterfacePtr> interfaces,
    std::shared_ptr<const Metadata::Metamodel::MetadataContainer> metamodel)
    : executor_(std::move(executor)), metamodel_(std::move(metamodel)) {
  for (const auto& iface : interfaces) Add(iface);
  for (const auto& iface : IntrospectionInterfaces()) Add(iface);

  // The checksum identifies the set of operations served.
  std::string all;
  for (const auto& service : serviceIds_) {
    for (const auto& op : operationsByService_[service]) all += service + "." + op + "\n";
  }
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int length = 0;
  EVP_Digest(all.data(), all.size(), digest, &length, EVP_sha256(), nullptr);
  Groundwork::AppendHex({reinterpret_cast<const char*>(digest), length}, checksum_);
}

void AsyncLocalProvider::Add(const ApiInterfacePtr& iface) {
  // Binding a service twice, or an operation twice, is a programming error.
  VERIFY(operationsByService_.count(iface->serviceId) == 0);
  interfaces_.push_back(iface);
  serviceIds_.push_back(iface->serviceId);
  auto& ops = operationsByService_[iface->serviceId];
  for (const auto& op : iface->operations) {
    VERIFY(operations_.emplace(iface->serviceId + "." + op.id, op.invoke).second);
    ops.push_back(op.id);
  }
}

void AsyncLocalProvider::Invoke(Core::CallPtr call, Core::Completion completion) {
  auto it = operations_.find(call->method);
  if (it == operations_.end()) {
    completion.Complete(MethodResult::Error(Core::OperationNotFoundError(call->method)));
    return;
  }
  const OperationInvoker& invoke = it->second;
  executor_([&invoke, call = std::move(call), completion = std::move(completion)]() mutable {
    invoke(call, std::move(completion));
  });
}

std::vector<ApiInterfacePtr> AsyncLocalProvider::IntrospectionInterfaces() {
  auto service = [](std::string_view name, std::vector<BoundOperation> ops) {
    return std::make_shared<const ApiInterface>(
        ApiInterface{std::string(kIntrospection) + std::string(name), std::move(ops)});
  };
  // The provider owns these operations, so `this` outlives them.
  auto operationsOf = [this](const std::string& serviceId) -> const std::vector<std::string>* {
    auto it = operationsByService_.find(serviceId);
    return it == operationsByService_.end() ? nullptr : &it->second;
  };
  return {
      service("provider", {BindQuery("get", {},
                                     [this](const Args&) {
                                       return MethodResult::Output(boost::json::object{
                                           {"id", kProviderName}, {"checksum", checksum_}});
                                     })}),
      service(
          "service",
          {BindQuery("list", {},
                     [this](const Args&) { return MethodResult::Output(Strings(serviceIds_)); }),
           BindQuery(
               "get", {{"id"}},
               [operationsOf](const Args& a) {
                 const auto* ops = operationsOf(*a[0]);
                 if (ops == nullptr) {
                   return MethodResult::Error(Core::MetadataNotFoundError("service", *a[0]));
                 }
                 return MethodResult::Output(boost::json::object{{"operations", Strings(*ops)}});
               })}),
      service("operation",
              {BindQuery("list", {{"serviceId"}},
                         [operationsOf](const Args& a) {
                           const auto* ops = operationsOf(*a[0]);
                           if (ops == nullptr) {
                             return MethodResult::Error(
                                 Core::MetadataNotFoundError("service", *a[0]));
                           }
                           return MethodResult::Output(Strings(*ops));
                         }),
               BindQuery("get", {{"serviceId"}, {"operationId"}},
                         [this](const Args& a) {
                           std::string method = *a[0] + "." + *a[1];
                           if (operations_.count(method) == 0) {
                             return MethodResult::Error(
                                 Core::MetadataNotFoundError("operation", method));
                           }
                           boost::json::object out{{"serviceId", *a[0]}, {"operationId", *a[1]}};
                           const boost::json::object* described =
                               metamodel_ ? metamodel_->Operations().Find(method) : nullptr;
                           if (described != nullptr) {
                             if (const auto* params = described->if_contains("params"))
                               out["params"] = *params;
                             if (const auto* output = described->if_contains("output"))
                               out["output"] = *output;
                             if (const auto* errors = described->if_contains("errors"))
                               out["errors"] = *errors;
                           }
                           return MethodResult::Output(std::move(out));
                         })}),
  };
}

}  // namespace Lumo::Provider
