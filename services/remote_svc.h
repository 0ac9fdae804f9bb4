// The remote server certificate listing
// "com.tarsel.orna.kms.providers.server_certificates.remote": the
// certificates a provider's key servers present, and whether they are
// trusted.
//
//   list(provider, spec?: FilterSpec) -> list of Summary
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"
#include "platform/lumo/messages.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc {

inline constexpr const char* kServiceId =
    "com.tarsel.orna.kms.providers.server_certificates.remote";

struct FilterSpec {
  std::optional<std::set<std::string>> servers;  // only these server names
  std::optional<bool> trusted;                   // only servers with this verdict
};

struct Summary {
  std::string server;
  std::optional<std::string> certificate;                  // PEM, when it could be fetched
  std::vector<::Lumo::L10n::LocalizableMessage> messages;  // why it could not
  bool trusted = false;
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Summary& in);
FilterSpec tag_invoke(boost::json::value_to_tag<FilterSpec>, const boost::json::value& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;
  // Completes its result exactly once.
  virtual void list(const std::string& provider, const std::optional<FilterSpec>& spec,
                    const ::Lumo::Core::AsyncActivation& activation,
                    ::Lumo::AsyncResult<std::vector<Summary>> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc
