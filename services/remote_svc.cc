#include "services/remote_svc.h"

#include "platform/lumo/json_storage.h"
#include "services/service_inputs.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc {

namespace json = boost::json;
using ::Lumo::Bindings::ObjectReader;

void tag_invoke(json::value_from_tag, json::value& out, const Summary& in) {
  json::object& o = out.emplace_object();
  o["server"] = in.server;
  if (in.certificate) {
    o["certificate"] = *in.certificate;
  } else {
    o["certificate"] = nullptr;
  }
  o["messages"] = ::Lumo::Data::MessagesToJson(in.messages);
  o["trusted"] = in.trusted;
}

FilterSpec tag_invoke(json::value_to_tag<FilterSpec>, const json::value& in) {
  ObjectReader r(in);
  FilterSpec out;
  if (auto servers = r.OptionalStringList("servers")) {
    out.servers.emplace(servers->begin(), servers->end());
  }
  out.trusted = r.OptionalBool("trusted");
  r.Finish();
  return out;
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  using Result = ::Lumo::AsyncResult<std::vector<Summary>>;
  using ListInput = ProviderOptionalSpecInput<FilterSpec>;
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {::Lumo::Provider::BindOperation<ListInput, std::vector<Summary>>(
          "list",
          [impl](ListInput in, Result result, const ::Lumo::Core::AsyncActivation& activation) {
            impl->list(in.provider, in.spec, activation, std::move(result));
          })}});
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc
