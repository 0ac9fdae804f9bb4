#include "services/csr_impl.h"

#include "config/config_lock.h"
#include "config/trust_material.h"
#include "errors/error_builders.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificate::CsrSvc {

using Zyrd::ZyrApi::MakeError;
using Zyrd::ZyrApi::MakeInvalidParameterError;
using Zyrd::ZyrApi::MakeProviderStoreError;
using Zyrd::ZyrApi::Message;
namespace SslUtils = Kestrel::Common::SslUtils;

CsrImpl::CsrImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void CsrImpl::create(const std::string& provider, ::Lumo::AsyncResult<Info> result) {
  if (provider.empty()) {
    Log_Level(2, "CSR create called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  Info info;
  info.privateKey.emplace();
  if (!SslUtils::GenerateKeyAndCsr(*info.privateKey, info.clientCSR)) {
    Log_Level(2, "Failed to generate key and csr\n");
    return result.SetError(MakeError({Message("com.tarsel.orna.kms.providers.csr_error")}));
  }
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  std::string key(info.privateKey->view());
  Groundwork::WipeOnExit wipe(key);
  int rc = Zyrd::Config::SetClientCsr(provider, info.clientCSR, key);
  if (rc == 3) {
    Log_Level(2, "Provider %s does not exist\n", provider.c_str());
    return result.SetError(Zyrd::ZyrApi::MakeProviderNotFoundError(provider));
  }
  if (rc != 0) {
    Log_Level(2, "Failed to write to config store\n");
    return result.SetError(
        MakeError({Message("com.tarsel.orna.kms.providers.config_store_error")}));
  }
  providers_->DeleteProviderFromState(provider);
  result.SetResult(info);
}

void CsrImpl::set(const std::string& provider, const SetSpec& spec,
                  ::Lumo::AsyncResult<void> result) {
  if (provider.empty()) {
    Log_Level(2, "CSR set called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  std::string standardized = spec.clientCSR;
  if (!SslUtils::StandardizePemCsr(standardized) ||
      !SslUtils::ValidatePemCsrWithKey(standardized, spec.privateKey.view())) {
    Log_Level(2, "Invalid CSR for the given private key\n");
    return result.SetError(MakeInvalidParameterError("clientCSR"));
  }
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  std::string key(spec.privateKey.view());
  Groundwork::WipeOnExit wipe(key);
  int rc = Zyrd::Config::SetClientCsr(provider, spec.clientCSR, key);
  if (rc != 0) {
    Log_Level(2, "CSR set failed for provider %s: %d\n", provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  providers_->DeleteProviderFromState(provider);
  result.SetResult();
}

void CsrImpl::get(const std::string& provider, const std::optional<GetSpec>& spec,
                  ::Lumo::AsyncResult<Info> result) {
  if (provider.empty()) {
    Log_Level(2, "CSR get called on an empty provider\n");
    return result.SetError(MakeInvalidParameterError("provider"));
  }
  Info info;
  std::string key;
  Groundwork::WipeOnExit wipe(key);
  int rc = Zyrd::Config::GetClientCsr(provider, info.clientCSR, key);
  if (rc != 0) {
    Log_Level(2, "CSR get failed for provider %s: %d\n", provider.c_str(), rc);
    return result.SetError(MakeProviderStoreError(rc, provider));
  }
  if (!info.clientCSR.empty() && !SslUtils::StandardizePemCsr(info.clientCSR)) {
    Log_Level(2, "Failed to standardize the CSR from config store: %s\n", info.clientCSR.c_str());
    return result.SetError(MakeError(
        {Message("com.tarsel.orna.kms.invalid_config_value", {{"parameter", "clientCSR"}})}));
  }
  if (spec && spec->Wanted()) info.privateKey.emplace(key);
  result.SetResult(info);
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::ClientCertificate::CsrSvc
