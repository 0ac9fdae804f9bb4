// The key provider records in the host configuration store.
//
// Object tree (group "kms", component "orna"):
//
//   "providers"/<provider>      provider (= instance id), master_key_id
//     "key_server"              type ("KMIP"), description, connection_timeout
//                               (long, seconds; -1 = not set), server_cert (list)
//       "proxy_server"          hostname, port            (zero or one)
//       "kmip_server"           username, credential
//         "servers"/<server>    name, hostname, port      (in configured order)
//         "client_certificate"  certificate, private_key  (zero or one)
//         "client_CSR"          certificate, private_key  (zero or one)
//
// Every function is synchronous, never throws (except where a header says
// so), logs its own failures at level 2 (a store exception's text also goes
// to the daemon logger) and returns a store status code. None takes
// "configLock" (config_lock.h); callers that change the store hold it for
// write. The functions are thread-safe as far as the store is; a
// ProviderConfigObjects working set belongs to one caller.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "config/provider_records.h"
#include "kms/kms_info.h"
#include "platform/configstore/config_store.h"

namespace Zyrd::Config {

// Store status codes.
inline constexpr int kStoreOk = 0;
inline constexpr int kStoreAlreadyExists = 1;
inline constexpr int kStoreError = 2;  // a store exception, or a required value missing
inline constexpr int kStoreNotFound = 3;

namespace ProvidersSvc = Com::Tarsel::Orna::Kms::ProvidersSvc;
using OrnaConfigStore::ConfigStoreObjectPtr;
using OrnaConfigStore::StoreObjectPtr;

// A provider's objects, as looked up or created. Changes made through the
// writers below stay in memory until WriteProvider.
struct ProviderConfigObjects {
  std::string name;
  ConfigStoreObjectPtr provider;
  StoreObjectPtr keyServer;
  StoreObjectPtr proxyServer;  // null when the provider has no proxy
  StoreObjectPtr kmipServer;
  std::vector<StoreObjectPtr> servers;  // in configured order
};

// ---- lookups ----

// The "providers" object of `name`: 3 when absent ("Provider %s not found").
int FindProviderObject(const std::string& name, ConfigStoreObjectPtr& provider);
// The sub-object `name` (empty instance) of `parent`: 3 when absent, logged
// at `notFoundLevel` (an error, unless the caller treats absence as normal).
int GetSubObject(const StoreObjectPtr& parent, const std::string& name, StoreObjectPtr& child,
                 int notFoundLevel = 2);
// The provider and its "key_server".
int GetKeyServerObject(const std::string& name, ConfigStoreObjectPtr& provider,
                       StoreObjectPtr& keyServer);
// The provider and the "kmip_server" under its "key_server".
int GetKmipServerObject(const std::string& name, ConfigStoreObjectPtr& provider,
                        StoreObjectPtr& kmipServer);
// The whole working set; a missing proxy is not an error (its not-found line
// is still logged).
int GetProviderObjects(const std::string& name, ProviderConfigObjects& objects);

// Replaces `ids` with the ids of all providers, in id order.
int ListProviderIds(std::vector<std::string>& ids);
// Replaces `providers` with one summary per provider, in id order.
int ListProviders(std::vector<std::shared_ptr<ProvidersSvc::Summary>>& providers);
// Appends the hostname of each server to `hosts` when `withServers`, and
// sets `proxyHost` to the proxy's hostname when `withProxy` and the provider
// has a proxy. 3 when the provider or one of its objects is missing; 2 for
// any other failure.
int GetProviderHosts(const std::string& name, bool withServers, bool withProxy,
                     std::vector<std::string>& hosts, std::string& proxyHost);
// Appends every host the provider uses: its servers', then its proxy's.
int GetAllProviderHosts(const std::string& name, std::vector<std::string>& hosts);

// ---- creating and changing ----

// Builds the objects of the new provider `objects.name` (provider,
// "key_server", "kmip_server"; no proxy, no servers) in memory. 1, with
// nothing changed, when the provider exists.
int CreateProviderObjects(ProviderConfigObjects& objects);

int SetMasterKeyId(ProviderConfigObjects& objects, const std::string& masterKeyId);
int SetType(ProviderConfigObjects& objects, const std::string& type);
int SetDescription(ProviderConfigObjects& objects, const std::string& description);
int SetConnectionTimeout(ProviderConfigObjects& objects, int64_t seconds);
int SetUserName(ProviderConfigObjects& objects, const std::string& username);
// Creates the proxy when missing and sets it; an empty hostname removes it.
int SetProxy(ProviderConfigObjects& objects, const std::string& hostname, int64_t port);
// Appends a server; a server of that name existing already gives 2.
int AddServer(ProviderConfigObjects& objects, const std::string& name, const std::string& hostname,
              int64_t port);
int DeleteAllServers(ProviderConfigObjects& objects);
// Stores the provider with everything under it, in one transaction.
int WriteProvider(const ProviderConfigObjects& objects);
// Removes the provider with everything under it; 3 when absent.
int DeleteProvider(const std::string& name);

// ---- reading whole records ----

// The provider as the providers API shows it. A stored connection timeout
// of -1 and an empty username read back as absent.
int ReadProviderInfo(const std::string& name, std::shared_ptr<ProvidersSvc::Info>& info);
// Everything the provider's key server client needs, trust material
// included; certificates come back standardised where possible. `info` is
// replaced only on success.
int ReadClientConfig(const std::string& name, Kms::KmsInfo& info);
// The public key (PEM) of the vouchd certificate stored at
// ("certificate", "attestation", "orna", ""); false when it is missing,
// empty or unusable.
bool ReadVouchdPublicKey(std::string& key);

}  // namespace Zyrd::Config
