#include "services/service_inputs.h"

namespace Com::Tarsel::Orna::Kms {

ProviderInput tag_invoke(boost::json::value_to_tag<ProviderInput>, const boost::json::value& in) {
  ::Lumo::Bindings::ObjectReader r(in);
  ProviderInput out{r.String("provider")};
  r.Finish();
  return out;
}

IncludePrivateKeySpec tag_invoke(boost::json::value_to_tag<IncludePrivateKeySpec>,
                                 const boost::json::value& in) {
  ::Lumo::Bindings::ObjectReader r(in);
  IncludePrivateKeySpec out{r.OptionalBool("includePrivateKey")};
  r.Finish();
  return out;
}

void PutOptionalSecret(boost::json::object& out, std::string_view name,
                       const std::optional<Groundwork::SecureString>& secret) {
  if (secret) {
    out[name] = secret->view();
  } else {
    out[name] = nullptr;
  }
}

}  // namespace Com::Tarsel::Orna::Kms
