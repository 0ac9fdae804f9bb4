#include "services/key_operation_svc.h"

namespace Com::Tarsel::Orna::Kms::KeyOperationSvc {

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const GeneratedKey& in) {
  boost::json::object& o = out.emplace_object();
  o["wrappedKey"] = in.wrappedKey;
  if (in.key) {
    o["key"] = in.key->view();
  } else {
    o["key"] = nullptr;
  }
}

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const DecryptResult& in) {
  out.emplace_object()["key"] = in.key.view();
}

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const EncryptResult& in) {
  out.emplace_object()["wrappedKey"] = in.wrappedKey;
}

GenerateKeyInput tag_invoke(boost::json::value_to_tag<GenerateKeyInput>,
                            const boost::json::value& in) {
  ::Lumo::Bindings::ObjectReader r(in);
  GenerateKeyInput out{r.String("provider"), r.Int64("keySize")};
  r.Finish();
  return out;
}

DecryptInput tag_invoke(boost::json::value_to_tag<DecryptInput>, const boost::json::value& in) {
  ::Lumo::Bindings::ObjectReader r(in);
  DecryptInput out{r.String("provider"), r.String("wrappedKey")};
  r.Finish();
  return out;
}

EncryptInput tag_invoke(boost::json::value_to_tag<EncryptInput>, const boost::json::value&) {
  return {};
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  using ::Lumo::Provider::BindOperation;
  using Activation = ::Lumo::Core::AsyncActivation;
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {BindOperation<GenerateKeyInput, GeneratedKey>(
           "generate_key",
           [impl](GenerateKeyInput in, ::Lumo::AsyncResult<GeneratedKey> result,
                  const Activation&) {
             impl->generate_key(in.provider, in.keySize, std::move(result));
           }),
       BindOperation<EncryptInput, EncryptResult>(
           "encrypt", [impl](EncryptInput, ::Lumo::AsyncResult<EncryptResult> result,
                             const Activation&) { impl->encrypt(std::move(result)); }),
       BindOperation<DecryptInput, DecryptResult>(
           "decrypt",
           [impl](DecryptInput in, ::Lumo::AsyncResult<DecryptResult> result, const Activation&) {
             impl->decrypt(in.provider, in.wrappedKey, std::move(result));
           })}});
}

}  // namespace Com::Tarsel::Orna::Kms::KeyOperationSvc
