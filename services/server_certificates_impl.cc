#include "services/server_certificates_impl.h"

#include "config/config_lock.h"
#include "config/trust_material.h"
#include "errors/error_builders.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc {

using Zyrd::ZyrApi::MakeInvalidParameterError;
using Zyrd::ZyrApi::MakeProviderStoreError;
using Zyrd::ZyrApi::Message;
namespace SslUtils = Kestrel::Common::SslUtils;

ServerCertificatesImpl::ServerCertificatesImpl(
    std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void ServerCertificatesImpl::set(const std::string& provider,
                                 const std::vector<std::string>& certificates,
                                 ::Lumo::AsyncResult<void> result) {
  if (provider.empty()) {
    Log_Level(2, "Server certificate set called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  if (certificates.size() > kMaxCertificates) {
    Log_Level(2, "Only %d certificates supported, %lu provided\n",
              static_cast<int>(kMaxCertificates), static_cast<unsigned long>(certificates.size()));
    return result.SetError(Zyrd::ZyrApi::MakeUnsupportedError(
        {Message("com.tarsel.orna.kms.providers.server_certs.limit_error",
                 {{"num", std::to_string(kMaxCertificates)}})}));
  }
  for (const auto& certificate : certificates) {
    std::string standardized = certificate;
    if (!SslUtils::StandardizePemCert(standardized) || !SslUtils::ValidatePemCert(standardized)) {
      return result.SetError(MakeInvalidParameterError("certificates"));
    }
  }
  Log_Level(6, "Server certificate set called on provider = %s\n", provider.c_str());
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  int rc = Zyrd::Config::SetServerCertificates(provider, certificates);
  if (rc != 0) {
    Log_Level(2, "Server certificate set failed for provider %s: %d\n", provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  providers_->DeleteProviderFromState(provider);
  result.SetResult();
}

void ServerCertificatesImpl::get(const std::string& provider, ::Lumo::AsyncResult<Info> result) {
  if (provider.empty()) {
    Log_Level(2, "Server certificate get called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  Log_Level(6, "Server certificate get called on provider = %s\n", provider.c_str());
  Info info;
  int rc = Zyrd::Config::GetServerCertificates(provider, info.certificates);
  if (rc != 0) {
    Log_Level(2, "Server certificate get failed for provider %s: %d\n", provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  for (auto& certificate : info.certificates) {
    if (!SslUtils::StandardizePemCert(certificate)) {
      Log_Level(2, "Failed to standardize the certificate from config store: %s\n",
                certificate.c_str());
      return result.SetError(Zyrd::ZyrApi::MakeError(
          {Message("com.tarsel.orna.kms.invalid_config_value", {{"parameter", "certificates"}})}));
    }
  }
  result.SetResult(info);
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificatesSvc
