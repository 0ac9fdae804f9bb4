#include "services/raw_config_svc.h"

#include "platform/util/base64.h"

namespace Com::Tarsel::Orna::Kms::RawConfigSvc {

namespace json = boost::json;
using ::Lumo::Bindings::DecodeError;
using ::Lumo::Bindings::ObjectReader;

namespace {

constexpr const char* kDefaultDateTime = "1970-01-01T00:00:00.000Z";

struct GetInput {
  std::optional<InfoType> infoType;
};
struct SetInput {
  Groundwork::SecureBytes configuration;
};

GetInput tag_invoke(json::value_to_tag<GetInput>, const json::value& in) {
  ObjectReader r(in);
  GetInput out{r.OptionalStruct<InfoType>("infoType")};
  r.Finish();
  return out;
}

SetInput tag_invoke(json::value_to_tag<SetInput>, const json::value& in) {
  ObjectReader r(in);
  SetInput out{r.Binary("configuration")};
  r.Finish();
  return out;
}

}  // namespace

void tag_invoke(json::value_from_tag, json::value& out, const Info& in) {
  json::object& o = out.emplace_object();
  if (in.configuration) {
    const auto& gz = *in.configuration;
    o["configuration"] =
        Groundwork::Base64EncodeSecret(reinterpret_cast<const uint8_t*>(gz.data()), gz.size())
            .view();
  } else {
    o["configuration"] = nullptr;
  }
  o["hash"] = in.hash;
  o["timestamp"] = kDefaultDateTime;
}

InfoType tag_invoke(json::value_to_tag<InfoType>, const json::value& in) {
  if (!in.is_string()) throw DecodeError("", "expected an info type");
  std::string text(in.get_string());
  if (text == "CONFIG_AND_HASH") return {InfoType::CONFIG_AND_HASH, std::move(text)};
  if (text == "HASH_ONLY") return {InfoType::HASH_ONLY, std::move(text)};
  return {InfoType::OPEN, std::move(text)};
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  using ::Lumo::AsyncResult;
  using ::Lumo::Provider::BindOperation;
  using Activation = ::Lumo::Core::AsyncActivation;
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {BindOperation<GetInput, Info>(
           "get", [impl](GetInput in, AsyncResult<Info> result,
                         const Activation&) { impl->get(in.infoType, std::move(result)); }),
       BindOperation<SetInput, void>(
           "set", [impl](SetInput in, AsyncResult<void> result, const Activation&) {
             impl->set(in.configuration, std::move(result));
           })}});
}

}  // namespace Com::Tarsel::Orna::Kms::RawConfigSvc
