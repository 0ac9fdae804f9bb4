// The credential service "com.tarsel.orna.kms.providers.credential": the
// secret sent with a provider's KMIP user name.
//
//   set(provider, credential: secret) -> nothing
//   get(provider)                     -> Info {credential: secret}
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <memory>
#include <string>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"
#include "platform/util/secure_buffer.h"

namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.providers.credential";

struct Info {
  Groundwork::SecureString credential;
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;
  // Each operation completes its result exactly once.
  virtual void set(const std::string& provider, const Groundwork::SecureString& credential,
                   ::Lumo::AsyncResult<void> result) = 0;
  virtual void get(const std::string& provider, ::Lumo::AsyncResult<Info> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::CredentialSvc
