// Readers of whole provider records: the API's provider info, the key server
// client's configuration, the provider list and hosts, the vouchd key.
#include "config/provider_config.h"
#include "config/store_access.h"
#include "platform/ssl/ssl_utils.h"

namespace Zyrd::Config {

using namespace Internal;
using OrnaConfigStore::ConfigStoreException;

namespace {

// Reads values of one record, remembering the name being read so that an
// exception can be reported with it.
class ValueReader {
 public:
  // Reads a value that may be absent.
  template <typename T>
  bool Optional(const StoreObjectPtr& object, const char* name, T* out) {
    reading_ = name;
    return object->GetValue(name, out);
  }
  // Reads a value that must be present; logs its absence.
  template <typename T>
  bool Required(const StoreObjectPtr& object, const char* name, T* out) {
    if (Optional(object, name, out)) return true;
    Log_Level(2, "Error reading %s from config store\n", name);
    return false;
  }
  int ReportException(const ConfigStoreException& e) const {
    ZYRD_LOG_STORE_EXCEPTION(e, "Exception reading %s from config store: %s\n", reading_, e.what());
    return kStoreError;
  }

 private:
  const char* reading_ = "";
};

// GetProviderObjects, logging a failure for the whole record.
int LoadProviderObjects(const std::string& name, ProviderConfigObjects& objects) {
  int rc = GetProviderObjects(name, objects);
  if (rc != kStoreOk) {
    Log_Level(2, "Error getting objects from config store for provider %s\n", name.c_str());
  }
  return rc;
}

// The standardised form of a stored certificate, or the stored text itself
// (with a warning) when it cannot be standardised.
std::string StandardizedCertificate(const std::string& stored) {
  std::string pem = stored;
  if (!Kestrel::Common::SslUtils::StandardizePemCert(pem)) {
    Log_Level(3, "Failed to standardize certificate.\n");
  }
  return pem;
}

int FillInfo(const ProviderConfigObjects& objects, ValueReader& r, ProvidersSvc::Info& info) {
  if (!r.Required(objects.provider, "master_key_id", &info.masterKeyId)) return kStoreError;
  auto& keyServer = info.keyServer;
  std::string type;
  if (!r.Required(objects.keyServer, "type", &type)) return kStoreError;
  keyServer.type = ProvidersSvc::KeyServerType::Open(type);
  r.Optional(objects.keyServer, "description", &keyServer.description);
  long timeout = -1;
  r.Optional(objects.keyServer, "connection_timeout", &timeout);
  if (timeout != -1) keyServer.connectionTimeout = timeout;
  if (objects.proxyServer) {
    ProvidersSvc::NetworkAddress proxy;
    long port = 0;
    if (!r.Required(objects.proxyServer, "hostname", &proxy.hostname) ||
        !r.Required(objects.proxyServer, "port", &port)) {
      return kStoreError;
    }
    proxy.port = port;
    keyServer.proxyServer = proxy;
  }
  std::string username;
  r.Optional(objects.kmipServer, "username", &username);
  if (!username.empty()) keyServer.kmipServer.username = username;
  for (const auto& object : objects.servers) {
    ProvidersSvc::Server server;
    long port = 0;
    if (!r.Required(object, "name", &server.name) ||
        !r.Required(object, "hostname", &server.address.hostname) ||
        !r.Required(object, "port", &port)) {
      return kStoreError;
    }
    server.address.port = port;
    keyServer.kmipServer.servers.push_back(std::move(server));
  }
  return kStoreOk;
}

int FillClientConfig(const ProviderConfigObjects& objects, ValueReader& r, Kms::KmsInfo& info) {
  if (!r.Required(objects.provider, "master_key_id", &info.masterKeyId)) return kStoreError;
  long timeout = 0;
  // A negative timeout is the "not set" mark (-1); the client's default
  // stays in force rather than a timeout that has already run out.
  if (r.Optional(objects.keyServer, "connection_timeout", &timeout) && timeout >= 0) {
    info.connectionTimeout = timeout;
  }
  std::vector<std::string> serverCerts;
  if (r.Optional(objects.keyServer, "server_cert", &serverCerts)) {
    for (const auto& cert : serverCerts) {
      info.trustedServerCertificates.push_back(StandardizedCertificate(cert));
    }
  }
  if (objects.proxyServer) {
    long port = 0;
    if (!r.Required(objects.proxyServer, "hostname", &info.proxyHost) ||
        !r.Required(objects.proxyServer, "port", &port)) {
      return kStoreError;
    }
    info.proxyPort = port;
  }
  r.Optional(objects.kmipServer, "username", &info.userName);
  r.Optional(objects.kmipServer, "credential", &info.password);
  for (const auto& object : objects.servers) {
    Kms::KmsServer server;
    long port = 0;
    if (!r.Required(object, "name", &server.name) ||
        !r.Required(object, "hostname", &server.hostname) || !r.Required(object, "port", &port)) {
      return kStoreError;
    }
    server.port = port;
    info.servers.push_back(std::move(server));
  }
  StoreObjectPtr clientCert =
      objects.kmipServer->GetSubObject(OrnaConfigStore::SubObjectId(kClientCertificate));
  if (clientCert) {
    std::string certificate;
    if (!r.Required(clientCert, "certificate", &certificate) ||
        !r.Required(clientCert, "private_key", &info.clientPrivateKey)) {
      return kStoreError;
    }
    info.clientCertificate = StandardizedCertificate(certificate);
  }
  return kStoreOk;
}

}  // namespace

int ReadProviderInfo(const std::string& name, std::shared_ptr<ProvidersSvc::Info>& info) {
  ProviderConfigObjects objects;
  int rc = LoadProviderObjects(name, objects);
  if (rc != kStoreOk) return rc;
  ValueReader reader;
  auto result = std::make_shared<ProvidersSvc::Info>();
  try {
    rc = FillInfo(objects, reader, *result);
  } catch (const ConfigStoreException& e) {
    return reader.ReportException(e);
  }
  if (rc == kStoreOk) info = std::move(result);
  return rc;
}

int ReadClientConfig(const std::string& name, Kms::KmsInfo& info) {
  ProviderConfigObjects objects;
  int rc = LoadProviderObjects(name, objects);
  if (rc != kStoreOk) return rc;
  ValueReader reader;
  Kms::KmsInfo result;
  result.name = name;
  try {
    rc = FillClientConfig(objects, reader, result);
  } catch (const ConfigStoreException& e) {
    return reader.ReportException(e);
  }
  if (rc == kStoreOk) info = result;
  return rc;
}

int ListProviderIds(std::vector<std::string>& ids) {
  std::vector<std::string> result;
  try {
    for (const auto& provider : GlobalStore()->GetObjectsByFilter(ProvidersFilter())) {
      std::string id;
      if (!provider->GetValue(OrnaConfigStore::kProviderIdValue, &id)) {
        Log_Level(2, "Error reading provider id\n");
        return kStoreError;
      }
      result.push_back(std::move(id));
    }
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error reading providers from config store %s\n", e.what());
    return kStoreError;
  }
  ids = std::move(result);
  return kStoreOk;
}

int ListProviders(std::vector<std::shared_ptr<ProvidersSvc::Summary>>& providers) {
  std::vector<std::string> ids;
  int rc = ListProviderIds(ids);
  if (rc != kStoreOk) return rc;
  providers.clear();
  for (auto& id : ids) {
    providers.push_back(std::make_shared<ProvidersSvc::Summary>(ProvidersSvc::Summary{id}));
  }
  return kStoreOk;
}

int GetProviderHosts(const std::string& name, bool withServers, bool withProxy,
                     std::vector<std::string>& hosts, std::string& proxyHost) {
  ProviderConfigObjects objects;
  int rc = LoadProviderObjects(name, objects);
  if (rc != kStoreOk) return rc;
  ValueReader reader;
  std::vector<std::string> serverHosts;
  std::string proxy;
  try {
    for (size_t i = 0; withServers && i < objects.servers.size(); ++i) {
      std::string host;
      if (!reader.Required(objects.servers[i], "hostname", &host)) return kStoreError;
      serverHosts.push_back(std::move(host));
    }
    if (withProxy && objects.proxyServer &&
        !reader.Required(objects.proxyServer, "hostname", &proxy)) {
      return kStoreError;
    }
  } catch (const ConfigStoreException& e) {
    return reader.ReportException(e);
  }
  hosts.insert(hosts.end(), serverHosts.begin(), serverHosts.end());
  if (withProxy && objects.proxyServer) proxyHost = proxy;
  return kStoreOk;
}

int GetAllProviderHosts(const std::string& name, std::vector<std::string>& hosts) {
  std::string proxy;
  int rc = GetProviderHosts(name, true, true, hosts, proxy);
  if (rc == kStoreOk && !proxy.empty()) hosts.push_back(proxy);
  return rc;
}

bool ReadVouchdPublicKey(std::string& key) {
  std::string certificate;
  try {
    OrnaConfigStore::ConfigStoreObjectId id("certificate", "attestation", kComponent);
    auto object = GlobalStore()->GetObject(id);
    if (object) object->GetValue("certificate", &certificate);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Exception reading property '%s' from config store: %s\n",
                             "certificate", e.what());
    return false;
  }
  if (certificate.empty()) {
    Log_Level(2, "Vouchd certificate is empty.\n");
    return false;
  }
  if (!Kestrel::Common::SslUtils::ExtractKeyFromCert(certificate, key)) {
    Log_Level(2, "Vouchd certificate holds no usable public key.\n");
    return false;
  }
  return true;
}

}  // namespace Zyrd::Config
