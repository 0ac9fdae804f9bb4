#include "services/client_certificate_impl.h"

#include "config/config_lock.h"
#include "config/trust_material.h"
#include "errors/error_builders.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificateSvc {

using Zyrd::ZyrApi::MakeError;
using Zyrd::ZyrApi::MakeInvalidArgumentError;
using Zyrd::ZyrApi::MakeInvalidParameterError;
using Zyrd::ZyrApi::MakeProviderStoreError;
using Zyrd::ZyrApi::Message;
namespace SslUtils = Kestrel::Common::SslUtils;

ClientCertificateImpl::ClientCertificateImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void ClientCertificateImpl::create(const std::string& provider, ::Lumo::AsyncResult<void> result) {
  if (provider.empty()) {
    Log_Level(2, "Client certificate create called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  Log_Level(6, "Client certificate create called on provider = %s\n", provider.c_str());
  Groundwork::SecureString key;
  std::string certificate;
  if (!SslUtils::GenerateKeyAndCert(key, certificate)) {
    Log_Level(2, "Failed to generate a new certificate/key for provider %s\n", provider.c_str());
    return result.SetError(
        MakeError({Message("com.tarsel.orna.kms.providers.crypto_error.create")}));
  }
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  std::string plainKey(key.view());
  Groundwork::WipeOnExit wipe(plainKey);
  int rc = Zyrd::Config::SetClientCertificate(provider, certificate, plainKey);
  if (rc != 0) {
    Log_Level(2, "Failed to save the client certificate/key for provider %s: %d\n",
              provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  providers_->DeleteProviderFromState(provider);
  result.SetResult();
}

void ClientCertificateImpl::set(const std::string& provider, const SetSpec& spec,
                                ::Lumo::AsyncResult<void> result) {
  if (provider.empty()) {
    Log_Level(2, "Client certificate set called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  Log_Level(6, "Client certificate set called on provider = %s %s private key\n", provider.c_str(),
            spec.privateKey ? "with" : "without");
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  auto fail = [&](int rc) {
    Log_Level(2, "Client certificate set failed for provider (%s): %d\n", provider.c_str(), rc);
    result.SetError(MakeProviderStoreError(rc, provider));
  };

  std::string key;
  Groundwork::WipeOnExit wipeKey(key);
  if (spec.privateKey) {
    key.assign(spec.privateKey->view());
  } else {
    std::string csr;
    int rc = Zyrd::Config::GetClientCsr(provider, csr, key);
    if (key.empty()) {
      Log_Level(2, "Unable to find private key for provider %s\n", provider.c_str());
      return result.SetError(
          MakeInvalidArgumentError({Message("com.tarsel.orna.kms.providers.private_key_unknown")}));
    }
    if (rc != 0) return fail(rc);
  }
  std::string standardized = spec.certificate;
  if (!SslUtils::StandardizePemCert(standardized) ||
      !SslUtils::ValidatePemCertWithKey(standardized, key)) {
    Log_Level(
        2, "Client certificate set called on an invalid certificate/key pair for provider (%s)\n",
        provider.c_str());
    return result.SetError(
        MakeInvalidArgumentError({Message("com.tarsel.orna.kms.providers.private_key_mismatch")}));
  }
  int rc = Zyrd::Config::SetClientCertificate(provider, spec.certificate, key);
  if (rc != 0) return fail(rc);
  providers_->DeleteProviderFromState(provider);
  result.SetResult();
}

void ClientCertificateImpl::get(const std::string& provider, const std::optional<GetSpec>& spec,
                                ::Lumo::AsyncResult<Info> result) {
  if (provider.empty()) {
    Log_Level(2, "Client certificate get called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  Log_Level(6, "Client certificate get called on provider = %s\n", provider.c_str());
  Info info;
  std::string key;
  Groundwork::WipeOnExit wipeKey(key);
  int rc = Zyrd::Config::GetClientCertificate(provider, info.certificate, key);
  if (rc != 0) {
    Log_Level(2, "Client certificate get failed for provider (%s): %d\n", provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  if (!info.certificate.empty() && !SslUtils::StandardizePemCert(info.certificate)) {
    Log_Level(2, "Failed to standardize the certificate from config store: %s\n",
              info.certificate.c_str());
    return result.SetError(MakeError(
        {Message("com.tarsel.orna.kms.invalid_config_value", {{"parameter", "certificate"}})}));
  }
  if (spec && spec->Wanted()) info.privateKey.emplace(key);
  result.SetResult(info);
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificateSvc
