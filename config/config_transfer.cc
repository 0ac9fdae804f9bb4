#include "config/config_transfer.h"

#include <vector>

#include "config/provider_config.h"
#include "config/store_access.h"
#include "platform/configstore/export_codec.h"
#include "platform/configstore/record_types.h"
#include "platform/ssl/ssl_utils.h"

namespace Zyrd::Config {

using namespace Internal;
using OrnaConfigStore::ConfigStoreException;
using OrnaConfigStore::ConfigStoreObjectId;

namespace {

constexpr const char* kZyrdConfigKey = "zyrd_config";

bool Sha256Hex(std::string_view text, std::string& hex) {
  return Kestrel::Common::SslUtils::ComputeHashHex(text, hex, "SHA256");
}

}  // namespace

int ExportConfig(std::string& config, std::string& digest) {
  return ExportConfig(config, digest, Sha256Hex);
}

int ExportConfig(std::string& config, std::string& digest, const DigestFunction& computeDigest) {
  std::string text;
  try {
    text = GlobalStore()->Export({ProvidersFilter()});
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Exception during export of config store: %s\n", e.what());
    return kStoreError;
  }
  std::string hex;
  if (!computeDigest(text, hex)) {
    Log_Level(2, "Hash computation failed while exporting\n");
    return kStoreError;
  }
  config = std::move(text);
  digest = std::move(hex);
  return kStoreOk;
}

int ImportConfig(const std::string& config) {
  std::vector<OrnaConfigStore::ErrorInfo> errors;
  try {
    if (!GlobalStore()->Import(config, errors)) {
      Log_Level(2, "Failed to import the given configuration\n");
      return kStoreError;
    }
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Exception during import of config store: %s\n", e.what());
    return kStoreError;
  }
  return kStoreOk;
}

bool CheckImportScope(const std::string& config, std::string& reason) {
  OrnaConfigStore::Codec::ExportContents contents;
  std::string ignored;
  if (!OrnaConfigStore::Codec::DecodeExport(config, contents, ignored)) return true;
  const ConfigStoreObjectId providers(kProvidersKey, kGroup, kComponent);
  // The scopes include the id of every object of the text.
  for (const auto& scope : contents.scopes) {
    if (!scope.SameScope(providers)) {
      reason = "it names " + scope.GetKey() + "/" + scope.GetGroup() + "/" + scope.GetComponent() +
               ", not only the providers";
      return false;
    }
  }
  return OrnaConfigStore::CheckRecordTypes(contents.objects, reason);
}

void RestoreConfig() {
  std::vector<OrnaConfigStore::ConfigStoreObjectPtr> instances;
  try {
    instances = GlobalStore()->GetDesiredUserConfigInstances(
        ConfigStoreObjectId(kProvidersKey, kGroup, kComponent), 0);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Failed to restore configuration key %s: %s\n", kProvidersKey,
                             e.what());
  }
  for (const auto& instance : instances) {
    const ConfigStoreObjectId& id = instance->GetConfigStoreObjectId();
    Log_Level(5, "Restoring configuration key %s instance %s\n", kProvidersKey,
              id.GetInstanceId().c_str());
    try {
      GlobalStore()->SetBootStatus(id, true);
    } catch (const ConfigStoreException& e) {
      ZYRD_LOG_STORE_EXCEPTION(e, "Failed to restore configuration key %s instance %s: %s\n",
                               kProvidersKey, id.GetInstanceId().c_str(), e.what());
    }
  }
  Log_Level(5, "Restoring configuration key %s\n", kZyrdConfigKey);
  try {
    GlobalStore()->SetBootStatus(ConfigStoreObjectId(kZyrdConfigKey, kGroup, kComponent), true);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Failed to restore configuration key %s: %s\n", kZyrdConfigKey,
                             e.what());
  }
}

}  // namespace Zyrd::Config
