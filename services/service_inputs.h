// Input records that many operations share: a provider alone, or a provider
// with a spec record (required or optional), decoded from a call's named
// inputs; and the wire form of an optional secret.
#pragma once

#include <boost/json/object.hpp>
#include <boost/json/value.hpp>
#include <boost/json/value_to.hpp>
#include <optional>
#include <string>
#include <string_view>

#include "platform/lumo/bindings.h"
#include "platform/util/secure_buffer.h"

namespace Com::Tarsel::Orna::Kms {

// {"provider": TEXT}
struct ProviderInput {
  std::string provider;
};
ProviderInput tag_invoke(boost::json::value_to_tag<ProviderInput>, const boost::json::value& in);

// {"provider": TEXT, "spec": Spec}
template <typename Spec>
struct ProviderSpecInput {
  std::string provider;
  Spec spec;
};

// {"provider": TEXT, "spec": Spec (optional)}
template <typename Spec>
struct ProviderOptionalSpecInput {
  std::string provider;
  std::optional<Spec> spec;
};

template <typename Spec>
ProviderSpecInput<Spec> tag_invoke(boost::json::value_to_tag<ProviderSpecInput<Spec>>,
                                   const boost::json::value& in) {
  ::Lumo::Bindings::ObjectReader r(in);
  ProviderSpecInput<Spec> out{r.String("provider"), r.Struct<Spec>("spec")};
  r.Finish();
  return out;
}

template <typename Spec>
ProviderOptionalSpecInput<Spec> tag_invoke(
    boost::json::value_to_tag<ProviderOptionalSpecInput<Spec>>, const boost::json::value& in) {
  ::Lumo::Bindings::ObjectReader r(in);
  ProviderOptionalSpecInput<Spec> out{r.String("provider"), r.OptionalStruct<Spec>("spec")};
  r.Finish();
  return out;
}

// {"includePrivateKey": BOOL (optional)}: whether a read returns the key.
struct IncludePrivateKeySpec {
  std::optional<bool> includePrivateKey;
  bool Wanted() const { return includePrivateKey.value_or(false); }
};
IncludePrivateKeySpec tag_invoke(boost::json::value_to_tag<IncludePrivateKeySpec>,
                                 const boost::json::value& in);

// Sets member `name` of `out` to the secret's text, or to null without one.
void PutOptionalSecret(boost::json::object& out, std::string_view name,
                       const std::optional<Groundwork::SecureString>& secret);

}  // namespace Com::Tarsel::Orna::Kms
