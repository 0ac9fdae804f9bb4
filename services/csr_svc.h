// The client CSR service "com.tarsel.orna.kms.providers.client_certificate.csr":
// a provider's pending certificate signing request and its private key.
//
//   create(provider)              -> Info (always with the private key)
//   get(provider, spec?: GetSpec) -> Info
//   set(provider, spec: SetSpec)  -> nothing
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <memory>
#include <optional>
#include <string>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"
#include "platform/util/secure_buffer.h"
#include "services/service_inputs.h"

namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificate::CsrSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.providers.client_certificate.csr";

struct SetSpec {
  std::string clientCSR;                // PEM
  Groundwork::SecureString privateKey;  // PEM
};

using GetSpec = IncludePrivateKeySpec;

struct Info {
  std::string clientCSR;  // empty when none is pending
  std::optional<Groundwork::SecureString> privateKey;
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in);
SetSpec tag_invoke(boost::json::value_to_tag<SetSpec>, const boost::json::value& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;
  // Each operation completes its result exactly once.
  virtual void create(const std::string& provider, ::Lumo::AsyncResult<Info> result) = 0;
  virtual void get(const std::string& provider, const std::optional<GetSpec>& spec,
                   ::Lumo::AsyncResult<Info> result) = 0;
  virtual void set(const std::string& provider, const SetSpec& spec,
                   ::Lumo::AsyncResult<void> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificate::CsrSvc
