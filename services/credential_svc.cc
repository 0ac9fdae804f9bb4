#include "services/credential_svc.h"

namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc {
namespace {

namespace json = boost::json;
using ::Lumo::Bindings::ObjectReader;

struct SetInput {
  std::string provider;
  Groundwork::SecureString credential;
};
struct GetInput {
  std::string provider;
};

SetInput tag_invoke(json::value_to_tag<SetInput>, const json::value& in) {
  ObjectReader r(in);
  SetInput out{r.String("provider"), r.Secret("credential")};
  r.Finish();
  return out;
}

GetInput tag_invoke(json::value_to_tag<GetInput>, const json::value& in) {
  ObjectReader r(in);
  GetInput out{r.String("provider")};
  r.Finish();
  return out;
}

}  // namespace

void tag_invoke(json::value_from_tag, json::value& out, const Info& in) {
  out.emplace_object()["credential"] = in.credential.view();
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
             impl->set(in.provider, in.credential, std::move(result));
           }),
       BindOperation<GetInput, Info>(
           "get", [impl](GetInput in, AsyncResult<Info> result, const Activation&) {
             impl->get(in.provider, std::move(result));
           })}});
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc
