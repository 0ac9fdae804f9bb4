#include "services/server_certificates_svc.h"

#include "services/service_inputs.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc {

namespace json = boost::json;
using ::Lumo::Bindings::ObjectReader;

namespace {

struct SetInput {
  std::string provider;
  std::vector<std::string> certificates;
};

SetInput tag_invoke(json::value_to_tag<SetInput>, const json::value& in) {
  ObjectReader r(in);
  SetInput out{r.String("provider"), r.StringList("certificates")};
  r.Finish();
  return out;
}

}  // namespace

void tag_invoke(json::value_from_tag, json::value& out, const Info& in) {
  out.emplace_object()["certificates"] = json::value_from(in.certificates);
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  using ::Lumo::AsyncResult;
  using ::Lumo::Provider::BindOperation;
  using Activation = ::Lumo::Core::AsyncActivation;
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {BindOperation<SetInput, void>(
           "set",
           [impl](SetInput in, AsyncResult<void> result, const Activation&) {
             impl->set(in.provider, in.certificates, std::move(result));
           }),
       BindOperation<ProviderInput, Info>(
           "get", [impl](ProviderInput in, AsyncResult<Info> result, const Activation&) {
             impl->get(in.provider, std::move(result));
           })}});
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc
