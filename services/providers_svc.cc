#include "services/providers_svc.h"

#include "services/service_inputs.h"

namespace Com::Tarsel::Orna::Kms::ProvidersSvc {

namespace json = boost::json;
using ::Lumo::Bindings::DecodeError;
using ::Lumo::Bindings::ObjectReader;

namespace {

// Optional fields are written as null when absent.
template <typename T>
json::value OrNull(const std::optional<T>& value) {
  return value ? json::value_from(*value) : json::value(nullptr);
}

}  // namespace

void tag_invoke(json::value_from_tag, json::value& out, const KeyServerType& in) {
  out = in.value == KeyServerType::KMIP ? "KMIP" : in.text;
}

void tag_invoke(json::value_from_tag, json::value& out, const NetworkAddress& in) {
  out = {{"hostname", in.hostname}, {"port", OrNull(in.port)}};
}

void tag_invoke(json::value_from_tag, json::value& out, const Server& in) {
  out = {{"name", in.name}, {"address", json::value_from(in.address)}};
}

void tag_invoke(json::value_from_tag, json::value& out, const KmipServerInfo& in) {
  out = {{"servers", json::value_from(in.servers)}, {"username", OrNull(in.username)}};
}

void tag_invoke(json::value_from_tag, json::value& out, const KeyServerInfo& in) {
  out = {{"type", json::value_from(in.type)},
         {"description", in.description},
         {"proxyServer", OrNull(in.proxyServer)},
         {"connectionTimeout", OrNull(in.connectionTimeout)},
         {"kmipServer", json::value_from(in.kmipServer)}};
}

void tag_invoke(json::value_from_tag, json::value& out, const Info& in) {
  out = {{"masterKeyId", in.masterKeyId}, {"keyServer", json::value_from(in.keyServer)}};
}

void tag_invoke(json::value_from_tag, json::value& out, const Summary& in) {
  out = {{"provider", in.provider}};
}

KeyServerType tag_invoke(json::value_to_tag<KeyServerType>, const json::value& in) {
  if (!in.is_string()) throw DecodeError("", "expected a key server type");
  std::string text(in.get_string());
  return text == "KMIP" ? KeyServerType::Kmip() : KeyServerType::Open(std::move(text));
}

NetworkAddress tag_invoke(json::value_to_tag<NetworkAddress>, const json::value& in) {
  ObjectReader r(in);
  NetworkAddress out{r.String("hostname"), r.OptionalInt64("port")};
  r.Finish();
  return out;
}

Server tag_invoke(json::value_to_tag<Server>, const json::value& in) {
  ObjectReader r(in);
  Server out{r.String("name"), r.Struct<NetworkAddress>("address")};
  r.Finish();
  return out;
}

KmipServerCreateSpec tag_invoke(json::value_to_tag<KmipServerCreateSpec>, const json::value& in) {
  ObjectReader r(in);
  KmipServerCreateSpec out{r.List<Server>("servers"), r.OptionalString("username")};
  r.Finish();
  return out;
}

KeyServerCreateSpec tag_invoke(json::value_to_tag<KeyServerCreateSpec>, const json::value& in) {
  ObjectReader r(in);
  KeyServerCreateSpec out;
  out.type = r.Struct<KeyServerType>("type");
  out.description = r.OptionalString("description");
  out.proxyServer = r.OptionalStruct<NetworkAddress>("proxyServer");
  out.connectionTimeout = r.OptionalInt64("connectionTimeout");
  out.kmipServer = r.Struct<KmipServerCreateSpec>("kmipServer");
  r.Finish();
  return out;
}

CreateSpec tag_invoke(json::value_to_tag<CreateSpec>, const json::value& in) {
  ObjectReader r(in);
  CreateSpec out;
  out.provider = r.String("provider");
  out.masterKeyId = r.String("masterKeyId");
  out.keyServer = r.Struct<KeyServerCreateSpec>("keyServer");
  r.Finish();
  return out;
}

KmipServerUpdateSpec tag_invoke(json::value_to_tag<KmipServerUpdateSpec>, const json::value& in) {
  ObjectReader r(in);
  KmipServerUpdateSpec out{r.OptionalList<Server>("servers"), r.OptionalString("username")};
  r.Finish();
  return out;
}

KeyServerUpdateSpec tag_invoke(json::value_to_tag<KeyServerUpdateSpec>, const json::value& in) {
  ObjectReader r(in);
  KeyServerUpdateSpec out;
  out.type = r.OptionalStruct<KeyServerType>("type");
  out.description = r.OptionalString("description");
  out.proxyServer = r.OptionalStruct<NetworkAddress>("proxyServer");
  out.connectionTimeout = r.OptionalInt64("connectionTimeout");
  out.kmipServer = r.OptionalStruct<KmipServerUpdateSpec>("kmipServer");
  r.Finish();
  return out;
}

UpdateSpec tag_invoke(json::value_to_tag<UpdateSpec>, const json::value& in) {
  ObjectReader r(in);
  UpdateSpec out{r.OptionalString("masterKeyId"),
                 r.OptionalStruct<KeyServerUpdateSpec>("keyServer")};
  r.Finish();
  return out;
}

namespace {

struct CreateInput {
  CreateSpec spec;
};

CreateInput tag_invoke(json::value_to_tag<CreateInput>, const json::value& in) {
  ObjectReader r(in);
  CreateInput out{r.Struct<CreateSpec>("spec")};
  r.Finish();
  return out;
}

}  // namespace

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  using ::Lumo::AsyncResult;
  using ::Lumo::Bindings::NoInput;
  using ::Lumo::Provider::BindOperation;
  using Activation = ::Lumo::Core::AsyncActivation;
  using UpdateInput = ProviderSpecInput<UpdateSpec>;
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {BindOperation<NoInput, std::vector<Summary>>(
           "list", [impl](NoInput, AsyncResult<std::vector<Summary>> result,
                          const Activation&) { impl->list(std::move(result)); }),
       BindOperation<CreateInput, void>(
           "create", [impl](CreateInput in, AsyncResult<void> result,
                            const Activation&) { impl->create(in.spec, std::move(result)); }),
       BindOperation<UpdateInput, void>(
           "update",
           [impl](UpdateInput in, AsyncResult<void> result, const Activation&) {
             impl->update(in.provider, in.spec, std::move(result));
           }),
       BindOperation<ProviderInput, void>(
           "delete", [impl](ProviderInput in, AsyncResult<void> result,
                            const Activation&) { impl->delete_(in.provider, std::move(result)); }),
       BindOperation<ProviderInput, Info>(
           "get", [impl](ProviderInput in, AsyncResult<Info> result, const Activation&) {
             impl->get(in.provider, std::move(result));
           })}});
}

}  // namespace Com::Tarsel::Orna::Kms::ProvidersSvc
