#include "services/raw_config_impl.h"

#include "config/config_lock.h"
#include "config/config_transfer.h"
#include "errors/error_builders.h"
#include "platform/ssl/gzip.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::RawConfigSvc {
namespace {

using Zyrd::ZyrApi::Message;

::Lumo::Data::ErrorValuePtr InvalidConfiguration() {
  return Zyrd::ZyrApi::MakeInvalidParameterError("configuration");
}

::Lumo::Data::ErrorValuePtr StoreError() {
  return Zyrd::ZyrApi::MakeError({Message("com.tarsel.orna.kms.raw_config.config_store_error")});
}

}  // namespace

RawConfigImpl::RawConfigImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void RawConfigImpl::get(const std::optional<InfoType>& infoType, ::Lumo::AsyncResult<Info> result) {
  if (infoType && infoType->value == InfoType::OPEN) {
    Log_Level(2, "Unknown info type requested\n");
    return result.SetError(Zyrd::ZyrApi::MakeInvalidArgumentError(
        {Message("com.tarsel.orna.kms.raw_config.unknown_infotype")}));
  }
  std::string config;
  Groundwork::WipeOnExit wipe(config);
  Info info;
  if (Zyrd::Config::ExportConfig(config, info.hash) != 0) {
    Log_Level(2, "Failed to read from config store\n");
    return result.SetError(StoreError());
  }
  if (infoType && infoType->value == InfoType::CONFIG_AND_HASH) {
    info.configuration.emplace();
    if (!Kestrel::Common::Gzip::CompressFromString(config, *info.configuration)) {
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
  std::string config(text.view());
  Groundwork::WipeOnExit wipe(config);
  text.Wipe();
  if (!Zyrd::Config::CheckImportScope(config, reason)) {
    Log_Level(2, "Raw configuration refused: %s\n", reason.c_str());
    return result.SetError(InvalidConfiguration());
  }
  UserLock::WriteGuard lock(Zyrd::Config::ConfigLock());
  if (Zyrd::Config::ImportConfig(config) != 0) {
    Log_Level(2, "Failed to write to config store\n");
    return result.SetError(StoreError());
  }
  providers_->DeleteAllProvidersFromState();
  result.SetResult();
}

}  // namespace Com::Tarsel::Orna::Kms::RawConfigSvc
