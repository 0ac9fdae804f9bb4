// The raw configuration service "com.tarsel.orna.kms.raw_config": the whole
// providers configuration as one gzip-compressed blob with its digest.
//
//   get(infoType?: InfoType) -> Info
//   set(configuration: binary) -> nothing
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <boost/json/value_to.hpp>
#include <memory>
#include <optional>
#include <string>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"
#include "platform/util/secure_buffer.h"

namespace Com::Tarsel::Orna::Kms::RawConfigSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.raw_config";

// What get returns; on the wire "CONFIG_AND_HASH", "HASH_ONLY", or any other
// text (the open form, which get refuses).
struct InfoType {
  enum Value : int { CONFIG_AND_HASH = 0, HASH_ONLY = 1, OPEN = 2 };
  Value value = HASH_ONLY;
  std::string text;
};

struct Info {
  // The export text compressed with gzip; absent unless asked for. It holds
  // credentials and private keys, hence the wiping buffer.
  std::optional<Groundwork::SecureString> configuration;
  std::string hash;  // digest of the uncompressed export text
  // A date-time that is always the default value: written as the epoch.
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in);
InfoType tag_invoke(boost::json::value_to_tag<InfoType>, const boost::json::value& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;

  // Each operation completes its result exactly once.
  virtual void get(const std::optional<InfoType>& infoType, ::Lumo::AsyncResult<Info> result) = 0;
  virtual void set(const Groundwork::SecureBytes& configuration,
                   ::Lumo::AsyncResult<void> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::RawConfigSvc
