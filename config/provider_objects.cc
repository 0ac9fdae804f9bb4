// Lookups, creation and writers of the provider records.
#include "config/provider_config.h"
#include "config/store_access.h"
#include "platform/util/panic.h"

namespace Zyrd::Config {

using namespace Internal;
using OrnaConfigStore::ConfigStoreException;
using OrnaConfigStore::ConfigStoreObject;
using OrnaConfigStore::SubObjectId;

int FindProviderObject(const std::string& name, ConfigStoreObjectPtr& provider) {
  try {
    provider = GlobalStore()->GetObject(ProviderId(name));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error getting provider config store object: %s\n", e.what());
    return kStoreError;
  }
  if (!provider) {
    Log_Level(2, "Provider %s not found\n", name.c_str());
    return kStoreNotFound;
  }
  return kStoreOk;
}

int GetSubObject(const StoreObjectPtr& parent, const std::string& name, StoreObjectPtr& child,
                 int notFoundLevel) {
  try {
    child = parent->GetSubObject(SubObjectId(name));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error getting %s from config store: %s\n", name.c_str(), e.what());
    return kStoreError;
  }
  if (!child) {
    Log_Level(notFoundLevel, "Config store object %s not found\n", name.c_str());
    return kStoreNotFound;
  }
  return kStoreOk;
}

int GetKeyServerObject(const std::string& name, ConfigStoreObjectPtr& provider,
                       StoreObjectPtr& keyServer) {
  int rc = FindProviderObject(name, provider);
  return rc != kStoreOk ? rc : GetSubObject(provider, kKeyServer, keyServer);
}

int GetKmipServerObject(const std::string& name, ConfigStoreObjectPtr& provider,
                        StoreObjectPtr& kmipServer) {
  StoreObjectPtr keyServer;
  int rc = GetKeyServerObject(name, provider, keyServer);
  return rc != kStoreOk ? rc : GetSubObject(keyServer, kKmipServer, kmipServer);
}

int GetProviderObjects(const std::string& name, ProviderConfigObjects& objects) {
  objects.name = name;
  int rc = GetKeyServerObject(name, objects.provider, objects.keyServer);
  if (rc != kStoreOk) return rc;
  // Most providers have no proxy: its absence is verbose detail, not an error.
  rc = GetSubObject(objects.keyServer, kProxyServer, objects.proxyServer, 6);
  if (rc == kStoreNotFound) {
    objects.proxyServer.reset();
  } else if (rc != kStoreOk) {
    return rc;
  }
  rc = GetSubObject(objects.keyServer, kKmipServer, objects.kmipServer);
  if (rc != kStoreOk) return rc;
  try {
    objects.servers = objects.kmipServer->GetSubObjectInstances(SubObjectFilter(kServers));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error getting servers from config store: %s\n", e.what());
    return kStoreError;
  }
  return kStoreOk;
}

int CreateProviderObjects(ProviderConfigObjects& objects) {
  auto id = ProviderId(objects.name);
  ConfigStoreObjectPtr provider;
  try {
    if (GlobalStore()->GetObject(id)) return kStoreAlreadyExists;
    provider = std::make_shared<ConfigStoreObject>(id);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error getting provider config store object: %s\n", e.what());
    return kStoreError;
  }
  StoreObjectPtr keyServer;
  try {
    keyServer = provider->CreateSubObject(SubObjectId(kKeyServer));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error creating key server configstore object %s\n", e.what());
    return kStoreError;
  }
  StoreObjectPtr kmipServer;
  try {
    kmipServer = keyServer->CreateSubObject(SubObjectId(kKmipServer));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error creating kmip server configstore object: %s\n", e.what());
    return kStoreError;
  }
  objects.provider = provider;
  objects.keyServer = keyServer;
  objects.proxyServer.reset();
  objects.kmipServer = kmipServer;
  objects.servers.clear();
  return kStoreOk;
}

namespace {

// Sets one value on `object`; a store exception logs `failureFormat` (one
// %s, the exception text) and gives 2.
template <typename T>
int SetOne(const StoreObjectPtr& object, const char* name, const T& value,
           const char* failureFormat) {
  VERIFY(object != nullptr);
  try {
    object->SetValue(name, value);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, failureFormat, e.what());
    return kStoreError;
  }
  return kStoreOk;
}

}  // namespace

int SetMasterKeyId(ProviderConfigObjects& objects, const std::string& masterKeyId) {
  return SetOne(objects.provider, "master_key_id", masterKeyId, "Error setting master key id %s\n");
}

int SetType(ProviderConfigObjects& objects, const std::string& type) {
  return SetOne(objects.keyServer, "type", type, "Error setting type %s\n");
}

int SetDescription(ProviderConfigObjects& objects, const std::string& description) {
  return SetOne(objects.keyServer, "description", description, "Error setting description %s\n");
}

int SetConnectionTimeout(ProviderConfigObjects& objects, int64_t seconds) {
  return SetOne(objects.keyServer, "connection_timeout", static_cast<long>(seconds),
                "Error setting connection timeout %s\n");
}

int SetUserName(ProviderConfigObjects& objects, const std::string& username) {
  return SetOne(objects.kmipServer, "username", username,
                "Error setting kmip server user name %s\n");
}

int SetProxy(ProviderConfigObjects& objects, const std::string& hostname, int64_t port) {
  VERIFY(objects.keyServer != nullptr);
  if (hostname.empty()) {
    try {
      objects.keyServer->DeleteSubObject(SubObjectId(kProxyServer));
    } catch (const ConfigStoreException& e) {
      ZYRD_LOG_STORE_EXCEPTION(e, "Error deleting proxy server config store object %s\n", e.what());
      return kStoreError;
    }
    objects.proxyServer.reset();
    return kStoreOk;
  }
  if (!objects.proxyServer) {
    try {
      objects.proxyServer = objects.keyServer->CreateSubObject(SubObjectId(kProxyServer));
    } catch (const ConfigStoreException& e) {
      ZYRD_LOG_STORE_EXCEPTION(e, "Error creating proxy server configstore object %s\n", e.what());
      return kStoreError;
    }
  }
  try {
    objects.proxyServer->SetValue("hostname", hostname);
    objects.proxyServer->SetValue("port", static_cast<long>(port));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error setting proxy server %s\n", e.what());
    return kStoreError;
  }
  return kStoreOk;
}

int AddServer(ProviderConfigObjects& objects, const std::string& name, const std::string& hostname,
              int64_t port) {
  VERIFY(objects.kmipServer != nullptr);
  StoreObjectPtr server;
  try {
    server = objects.kmipServer->CreateSubObject(SubObjectId(kServers, name));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error creating server configstore object: %s\n", e.what());
    return kStoreError;
  }
  try {
    server->SetValue("name", name);
    server->SetValue("hostname", hostname);
    server->SetValue("port", static_cast<long>(port));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error setting server %s\n", e.what());
    return kStoreError;
  }
  objects.servers.push_back(server);
  return kStoreOk;
}

int DeleteAllServers(ProviderConfigObjects& objects) {
  VERIFY(objects.kmipServer != nullptr);
  try {
    objects.kmipServer->DeleteSubObjectInstances(SubObjectFilter(kServers));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error deleting servers configstore objects %s\n", e.what());
    return kStoreError;
  }
  objects.servers.clear();
  return kStoreOk;
}

int WriteProvider(const ProviderConfigObjects& objects) {
  VERIFY(objects.provider != nullptr);
  try {
    GlobalStore()->WriteObject(objects.provider, 0);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error writing to config store: %s\n", e.what());
    return kStoreError;
  }
  return kStoreOk;
}

int DeleteProvider(const std::string& name) {
  try {
    auto store = GlobalStore();
    auto id = ProviderId(name);
    if (!store->GetObject(id)) {
      Log_Level(2, "Provider %s not found\n", name.c_str());
      return kStoreNotFound;
    }
    store->DeleteObject(id);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Failed to delete provider %s from configstore: %s\n", name.c_str(),
                             e.what());
    return kStoreError;
  }
  return kStoreOk;
}

}  // namespace Zyrd::Config
