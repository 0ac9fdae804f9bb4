#include "services/raw_config_impl.h"

#include <openssl/crypto.h>

#include "config/config_lock.h"
#include "config/config_transfer.h"
#include "errors/error_builders.h"
#include "platform/ssl/gzip.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::RawConfigSvc {
namespace {

using Zyrd::ZyrApi::Message;

::Lumo::Data::ErrorValuePtr InvalidConfiguration() {
  return Zyrd::ZyrApi::MakeInvalidArgumentError({Message(
      "com.tarsel.orna.kms.providers.invalid_argument", {{"parameter", "configuration"}})});
}

::Lumo::Data::ErrorValuePtr StoreError() {
  return Zyrd::ZyrApi::MakeError({Message("com.tarsel.orna.kms.raw_config.config_store_error")});
}

// A std::string copy of a secret text for the calls that take one; wiped
// when it goes away (it is never resized, so no other copy is left).
struct WipedCopy {
  explicit WipedCopy(std::string_view text) : text(text) {}
  ~WipedCopy() { OPENSSL_cleanse(text.data(), text.size()); }
  std::string text;
};

}  // namespace

RawConfigImpl::RawConfigImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void RawConfigImpl::get(const std::optional<InfoType>& infoType, ::Lumo::AsyncResult<Info> result) {
  if (infoType && infoType->value == InfoType::OPEN) {
    Log_Level(2, "Unknown info type requested\n");
    return result.SetError(Zyrd::ZyrApi::MakeInvalidArgumentError(
        {Message("com.tarsel.orna.kms.raw_config.unknown_infotype")}));
  }
  WipedCopy config("");
  Info info;
  if (Zyrd::Config::ExportConfig(config.text, info.hash) != 0) {
    Log_Level(2, "Failed to read from config store\n");
    return result.SetError(StoreError());
  }
  if (infoType && infoType->value == InfoType::CONFIG_AND_HASH) {
    info.configuration.emplace();
    if (!Kestrel::Common::Gzip::CompressFromString(config.text, *info.configuration)) {
      Log_Level(2, "Failed to compress the configuration\n");
      return result.SetError(
          Zyrd::ZyrApi::MakeError({Message("com.tarsel.orna.kms.raw_config.compress_error")}));
    }
  }
  result.SetResult(info);
}

void RawConfigImpl::set(const Groundwork::SecureBytes& configuration,
                        ::Lumo::AsyncResult<void> result) {
  if (configuration.empty()) {
    Log_Level(2, "Raw config set called on an empty configuration\n");
    return result.SetError(InvalidConfiguration());
  }
  Groundwork::SecureString text;
  std::string reason;
  if (!Kestrel::Common::Gzip::DecompressToString(
          std::string_view(reinterpret_cast<const char*>(configuration.data()),
                           configuration.size()),
          text, kMaxConfigurationSize, &reason)) {
    Log_Level(2, "Invalid configuation: decompression failed\n");
    Log_Level(2, "Raw configuration refused: %s\n", reason.c_str());
    return result.SetError(InvalidConfiguration());
  }
  WipedCopy config(text.view());
  text.Wipe();
  if (!Zyrd::Config::CheckImportScope(config.text, reason)) {
    Log_Level(2, "Raw configuration refused: %s\n", reason.c_str());
    return result.SetError(InvalidConfiguration());
  }
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  if (Zyrd::Config::ImportConfig(config.text) != 0) {
    Log_Level(2, "Failed to write to config store\n");
    return result.SetError(StoreError());
  }
  providers_->DeleteAllProvidersFromState();
  result.SetResult();
}

}  // namespace Com::Tarsel::Orna::Kms::RawConfigSvc
