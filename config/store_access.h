// Names and helpers shared by the configuration layer's sources.
#pragma once

#include <memory>
#include <string>

#include "daemon/logger.h"
#include "platform/configstore/config_store.h"
#include "platform/util/log.h"

namespace Zyrd::Config::Internal {

inline constexpr const char* kProvidersKey = "providers";
inline constexpr const char* kGroup = "kms";
inline constexpr const char* kComponent = "orna";
inline constexpr const char* kKeyServer = "key_server";
inline constexpr const char* kProxyServer = "proxy_server";
inline constexpr const char* kKmipServer = "kmip_server";
inline constexpr const char* kServers = "servers";
inline constexpr const char* kClientCertificate = "client_certificate";
inline constexpr const char* kClientCsr = "client_CSR";

// The global store; throws ConfigStoreException when it cannot be opened.
inline std::shared_ptr<OrnaConfigStore::ConfigStore> GlobalStore() {
  return OrnaConfigStore::ConfigStore::GetStore(OrnaConfigStore::sGlobalNamespace);
}

inline OrnaConfigStore::ConfigStoreObjectId ProviderId(const std::string& name) {
  OrnaConfigStore::ConfigStoreObjectId id(kProvidersKey, kGroup, kComponent);
  id.SetInstanceId(name);
  return id;
}

inline OrnaConfigStore::FilterSpecObject ProvidersFilter() {
  return OrnaConfigStore::FilterSpecObject(
      OrnaConfigStore::ConfigStoreObjectId(kProvidersKey, kGroup, kComponent));
}

// Selects every instance of the sub-object `name`.
inline OrnaConfigStore::FilterSpecObject SubObjectFilter(const std::string& name) {
  using OrnaConfigStore::kEmptyString;
  return OrnaConfigStore::FilterSpecObject(
      OrnaConfigStore::ConfigStoreObjectId(name, kEmptyString, kEmptyString, kEmptyString));
}

}  // namespace Zyrd::Config::Internal

// Logs an error line (level 2, printf-style) about a store exception `e`,
// then reports the exception's text through the daemon logger.
#define ZYRD_LOG_STORE_EXCEPTION(e, ...)           \
  do {                                             \
    Log_Level(2, __VA_ARGS__);                     \
    ::Zyrd::ZyrApi::LogToDaemonLogger((e).what()); \
  } while (0)
