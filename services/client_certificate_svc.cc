#include "services/client_certificate_svc.h"

namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificateSvc {

namespace json = boost::json;
using ::Lumo::Bindings::ObjectReader;

void tag_invoke(json::value_from_tag, json::value& out, const Info& in) {
  json::object& o = out.emplace_object();
  o["certificate"] = in.certificate;
  PutOptionalSecret(o, "privateKey", in.privateKey);
}

SetSpec tag_invoke(json::value_to_tag<SetSpec>, const json::value& in) {
  ObjectReader r(in);
  SetSpec out{r.String("certificate"), r.OptionalSecret("privateKey")};
  r.Finish();
  return out;
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  using ::Lumo::AsyncResult;
  using ::Lumo::Provider::BindOperation;
  using Activation = ::Lumo::Core::AsyncActivation;
  using GetInput = ProviderOptionalSpecInput<GetSpec>;
  using SetInput = ProviderSpecInput<SetSpec>;
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {BindOperation<ProviderInput, void>(
           "create", [impl](ProviderInput in, AsyncResult<void> result,
                            const Activation&) { impl->create(in.provider, std::move(result)); }),
       BindOperation<GetInput, Info>(
           "get",
           [impl](GetInput in, AsyncResult<Info> result, const Activation&) {
             impl->get(in.provider, in.spec, std::move(result));
           }),
       BindOperation<SetInput, void>(
           "set", [impl](SetInput in, AsyncResult<void> result, const Activation&) {
             impl->set(in.provider, in.spec, std::move(result));
           })}});
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificateSvc
