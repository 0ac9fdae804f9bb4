#include "services/status_svc.h"

#include "platform/lumo/json_storage.h"

namespace Com::Tarsel::Orna::Kms {

const char* HealthName(Health health) {
  switch (health) {
    case Health::HEALTHY:
      return "HEALTHY";
    case Health::WARNING:
      return "WARNING";
    case Health::ERROR:
      return "ERROR";
  }
  return "ERROR";
}

}  // namespace Com::Tarsel::Orna::Kms

namespace Com::Tarsel::Orna::Kms::StatusSvc {

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in) {
  boost::json::object& o = out.emplace_object();
  o["health"] = HealthName(in.health);
  o["details"] = in.details;
  o["messages"] = ::Lumo::Data::MessagesToJson(in.messages);
}

::Lumo::Provider::ApiInterfacePtr AsyncServiceBinder::BindImplementation(
    std::shared_ptr<AsyncServiceInterface> impl) {
  return std::make_shared<const ::Lumo::Provider::ApiInterface>(::Lumo::Provider::ApiInterface{
      kServiceId,
      {::Lumo::Provider::BindOperation<::Lumo::Bindings::NoInput, Info>(
          "get", [impl](::Lumo::Bindings::NoInput, ::Lumo::AsyncResult<Info> result,
                        const ::Lumo::Core::AsyncActivation&) { impl->get(std::move(result)); })}});
}

}  // namespace Com::Tarsel::Orna::Kms::StatusSvc
