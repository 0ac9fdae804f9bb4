// The host status service "com.tarsel.orna.kms.status": whether the daemon as
// a whole is up.
//
//   get() -> Info {health, details, messages}
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <memory>
#include <string>
#include <vector>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"
#include "platform/lumo/messages.h"

namespace Com::Tarsel::Orna::Kms {

// Health of the daemon, a provider or a key server; on the wire "HEALTHY",
// "WARNING" or "ERROR".
enum class Health : int { HEALTHY = 1, WARNING = 2, ERROR = 3 };
const char* HealthName(Health health);

}  // namespace Com::Tarsel::Orna::Kms

namespace Com::Tarsel::Orna::Kms::StatusSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.status";

struct Info {
  Health health = Health::HEALTHY;
  std::string details;
  std::vector<::Lumo::L10n::LocalizableMessage> messages;
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;
  virtual void get(::Lumo::AsyncResult<Info> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::StatusSvc
