#include "services/client_certificate_svc.h"

namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificateSvc {

namespace json = boost::json;
using ::Lumo::Bindings::ObjectReader;

namespace {

struct ProviderInput {
  std::string provider;
};
struct GetInput {
  std::string provider;
  std::optional<GetSpec> spec;
};
struct SetInput {
  std::string provider;
  SetSpec spec;
};

ProviderInput tag_invoke(json::value_to_tag<ProviderInput>, const json::value& in) {
  ObjectReader r(in);
  ProviderInput out{r.String("provider")};
  r.Finish();
  return out;
}

GetInput tag_invoke(json::value_to_tag<GetInput>, const json::value& in) {
  ObjectReader r(in);
  GetInput out{r.String("provider"), r.OptionalStruct<GetSpec>("spec")};
  r.Finish();
  return out;
}

SetInput tag_invoke(json::value_to_tag<SetInput>, const json::value& in) {
  ObjectReader r(in);
  SetInput out{r.String("provider"), r.Struct<SetSpec>("spec")};
  r.Finish();
  return out;
}

}  // namespace

void tag_invoke(json::value_from_tag, json::value& out, const Info& in) {
  json::object& o = out.emplace_object();
  o["certificate"] = in.certificate;
  if (in.privateKey) {
    o["privateKey"] = in.privateKey->view();
  } else {
    o["privateKey"] = nullptr;
  }
}

SetSpec tag_invoke(json::value_to_tag<SetSpec>, const json::value& in) {
  ObjectReader r(in);
  SetSpec out{r.String("certificate"), r.OptionalSecret("privateKey")};
  r.Finish();
  return out;
}

GetSpec tag_invoke(json::value_to_tag<GetSpec>, const json::value& in) {
  ObjectReader r(in);
  GetSpec out{r.OptionalBool("includePrivateKey")};
  r.Finish();
  return out;
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  using ::Lumo::AsyncResult;
  using ::Lumo::Provider::BindOperation;
  using Activation = ::Lumo::Core::AsyncActivation;
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
