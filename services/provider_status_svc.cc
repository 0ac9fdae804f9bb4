#include "services/provider_status_svc.h"

#include "platform/lumo/json_storage.h"
#include "services/service_inputs.h"

namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc {

namespace json = boost::json;

void tag_invoke(json::value_from_tag, json::value& out, const ServerInfo& in) {
  out = {{"health", HealthName(in.health)},
         {"details", in.details},
         {"messages", ::Lumo::Data::MessagesToJson(in.messages)},
         {"clientTrustServer", in.clientTrustServer},
         {"serverTrustClient", in.serverTrustClient},
         {"name", in.name}};
}

void tag_invoke(json::value_from_tag, json::value& out, const Info& in) {
  out = {{"health", HealthName(in.health)},
         {"details", in.details},
         {"messages", ::Lumo::Data::MessagesToJson(in.messages)},
         {"servers", json::value_from(in.servers)}};
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {::Lumo::Provider::BindOperation<ProviderInput, Info>(
          "get", [impl](ProviderInput in, ::Lumo::AsyncResult<Info> result,
                        const ::Lumo::Core::AsyncActivation& activation) {
            impl->get(in.provider, activation, std::move(result));
          })}});
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc
