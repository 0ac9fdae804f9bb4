// The trusted server certificates service
// "com.tarsel.orna.kms.providers.server_certificates": the key-server
// certificates a provider's connections trust.
//
//   set(provider, certificates: list of PEM) -> nothing
//   get(provider)                            -> Info {certificates}
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <memory>
#include <string>
#include <vector>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.providers.server_certificates";

struct Info {
  std::vector<std::string> certificates;
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;
  // Each operation completes its result exactly once.
  virtual void set(const std::string& provider, const std::vector<std::string>& certificates,
                   ::Lumo::AsyncResult<void> result) = 0;
  virtual void get(const std::string& provider, ::Lumo::AsyncResult<Info> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc
