// The provider status service "com.tarsel.orna.kms.providers.status": how
// healthy a provider's key servers are, and why.
//
//   get(provider) -> Info {health, details, messages, servers: [ServerInfo]}
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <memory>
#include <string>
#include <vector>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"
#include "platform/lumo/messages.h"
#include "services/status_svc.h"

namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.providers.status";

struct ServerInfo {
  Health health = Health::HEALTHY;
  std::string details;  // always empty
  std::vector<::Lumo::L10n::LocalizableMessage> messages;
  bool clientTrustServer = false;
  bool serverTrustClient = false;
  std::string name;
};

struct Info {
  Health health = Health::HEALTHY;
  std::string details;  // always empty
  std::vector<::Lumo::L10n::LocalizableMessage> messages;
  std::vector<ServerInfo> servers;
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const ServerInfo& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;
  // Completes its result exactly once.
  virtual void get(const std::string& provider, const ::Lumo::Core::AsyncActivation& activation,
                   ::Lumo::AsyncResult<Info> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc
