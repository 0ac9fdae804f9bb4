#include "config/trust_material.h"

#include "config/provider_config.h"
#include "config/store_access.h"

namespace Zyrd::Config {

using namespace Internal;
using HostCtl::Lib::HostCtlException;
using OrnaConfigStore::ConfigStoreException;
using OrnaConfigStore::SubObjectId;

namespace {

// Looks up the provider and its "kmip_server". When `failureFormat` is given,
// a failure is also logged with it (provider, code).
int FindKmipServer(const std::string& provider, ConfigStoreObjectPtr& object,
                   StoreObjectPtr& kmipServer, const char* failureFormat = nullptr) {
  int rc = GetKmipServerObject(provider, object, kmipServer);
  if (rc != kStoreOk && failureFormat != nullptr) {
    Log_Level(2, failureFormat, provider.c_str(), rc);
  }
  return rc;
}

// Stores the changed provider; a failure is logged with `failureFormat`
// (the exception text) and gives 2.
int Commit(const ConfigStoreObjectPtr& object, const char* failureFormat) {
  try {
    GlobalStore()->UpdateObject(object, 0);
  } catch (const HostCtlException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, failureFormat, e.what());
    return kStoreError;
  }
  return kStoreOk;
}

constexpr const char* kCsrLookupFailed =
    "Unable to find provider or kmip server config for %s: %d\n";

// Runs `read`, which reads values named `what` and returns a status; a value
// of another type than asked for is logged and gives 2.
template <typename Read>
int CatchingReadErrors(const char* what, Read read) {
  try {
    return read();
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Exception reading %s from config store: %s\n", what, e.what());
    return kStoreError;
  }
}

}  // namespace

int GetCredential(const std::string& provider, std::string& credential) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr kmipServer;
  int rc = FindKmipServer(provider, object, kmipServer,
                          "Get credential could not find kmip server for provider %s: %d\n");
  if (rc != kStoreOk) return rc;
  Log_Level(6, "Getting credential for the provider %s\n", provider.c_str());
  try {
    kmipServer->GetValue("credential", &credential);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Exception reading %s from config store: %s\n", "credential",
                             e.what());
    return kStoreError;
  }
  return kStoreOk;
}

int SetCredential(const std::string& provider, const std::string& credential) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr kmipServer;
  int rc = FindKmipServer(provider, object, kmipServer,
                          "Set credential could not find kmip server for provider %s: %d\n");
  if (rc != kStoreOk) return rc;
  Log_Level(6, "Setting credential for the provider %s\n", provider.c_str());
  kmipServer->SetValue("credential", credential);
  return Commit(object, "Set credential failed to write to configstore: %s\n");
}

int GetClientCertificate(const std::string& provider, std::string& certificate,
                         std::string& privateKey) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr kmipServer;
  int rc = FindKmipServer(provider, object, kmipServer);
  if (rc != kStoreOk) return rc;
  StoreObjectPtr clientCert = kmipServer->GetSubObject(SubObjectId(kClientCertificate));
  if (!clientCert) {
    certificate.clear();
    return kStoreOk;
  }
  return CatchingReadErrors("client certificate", [&] {
    if (!clientCert->GetValue("certificate", &certificate)) {
      Log_Level(2, "Error reading client certificate from config store for provider %s\n",
                provider.c_str());
      return kStoreError;
    }
    if (!clientCert->GetValue("private_key", &privateKey)) {
      Log_Level(2, "Error reading private key from config store for provider %s\n",
                provider.c_str());
      return kStoreError;
    }
    return kStoreOk;
  });
}

int SetClientCertificate(const std::string& provider, const std::string& certificate,
                         const std::string& privateKey) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr kmipServer;
  int rc = FindKmipServer(provider, object, kmipServer);
  if (rc != kStoreOk) return rc;
  StoreObjectPtr clientCert = kmipServer->GetSubObject(SubObjectId(kClientCertificate));
  if (!clientCert) {
    try {
      clientCert = kmipServer->CreateSubObject(SubObjectId(kClientCertificate));
    } catch (const HostCtlException& e) {
      ZYRD_LOG_STORE_EXCEPTION(
          e, "Error creating client certificate config store object for provider %s: %s\n",
          provider.c_str(), e.what());
      return kStoreError;
    }
  }
  clientCert->SetValue("certificate", certificate);
  clientCert->SetValue("private_key", privateKey);
  return Commit(object, "Error writing client certificate to configstore: %s\n");
}

int GetClientCsr(const std::string& provider, std::string& csr, std::string& privateKey) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr kmipServer;
  int rc = FindKmipServer(provider, object, kmipServer, kCsrLookupFailed);
  if (rc != kStoreOk) return rc;
  StoreObjectPtr clientCsr;
  try {
    clientCsr = kmipServer->GetSubObject(SubObjectId(kClientCsr));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error get client CSR configstore object %s\n", e.what());
    return kStoreError;
  }
  if (!clientCsr) {
    Log_Level(6, "Client CSR for %s provider not found\n", provider.c_str());
    return kStoreOk;
  }
  return CatchingReadErrors("client CSR", [&] {
    clientCsr->GetValue("certificate", &csr);
    clientCsr->GetValue("private_key", &privateKey);
    return kStoreOk;
  });
}

int SetClientCsr(const std::string& provider, const std::string& csr,
                 const std::string& privateKey) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr kmipServer;
  int rc = FindKmipServer(provider, object, kmipServer, kCsrLookupFailed);
  if (rc != kStoreOk) return rc;
  StoreObjectPtr clientCsr;
  try {
    clientCsr = kmipServer->GetSubObject(SubObjectId(kClientCsr));
    if (!clientCsr) clientCsr = kmipServer->CreateSubObject(SubObjectId(kClientCsr));
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Error create/get client csr configstore object %s\n", e.what());
    return kStoreError;
  }
  try {
    clientCsr->SetValue("certificate", csr);
    clientCsr->SetValue("private_key", privateKey);
    GlobalStore()->UpdateObject(object, 0);
  } catch (const ConfigStoreException& e) {
    ZYRD_LOG_STORE_EXCEPTION(e, "Caught ConfigStore exception during setting csr and key %s\n",
                             e.what());
    return kStoreError;
  }
  return kStoreOk;
}

int GetServerCertificates(const std::string& provider, std::vector<std::string>& certificates) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr keyServer;
  int rc = GetKeyServerObject(provider, object, keyServer);
  if (rc != kStoreOk) return rc;
  return CatchingReadErrors("server_cert", [&] {
    std::vector<std::string> stored;
    if (keyServer->GetValue("server_cert", &stored)) {
      certificates.insert(certificates.end(), stored.begin(), stored.end());
      Log_Level(6, "%lu certificates found in configstore\n",
                static_cast<unsigned long>(stored.size()));
    }
    return kStoreOk;
  });
}

int SetServerCertificates(const std::string& provider,
                          const std::vector<std::string>& certificates) {
  ConfigStoreObjectPtr object;
  StoreObjectPtr keyServer;
  int rc = GetKeyServerObject(provider, object, keyServer);
  if (rc != kStoreOk) return rc;
  keyServer->SetValue("server_cert", certificates);
  return Commit(object, "Error writing to configstore: %s\n");
}

}  // namespace Zyrd::Config
