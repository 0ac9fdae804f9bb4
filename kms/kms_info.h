// A provider's client configuration: everything the key server client needs
// to reach the provider's KMIP servers. Read from the configuration store,
// shared by the client and never changed after construction.
#pragma once

#include <openssl/crypto.h>

#include <cstdint>
#include <string>
#include <vector>

namespace Zyrd::Kms {

struct KmsServer {
  std::string name;
  std::string hostname;
  int64_t port = 0;
};

struct KmsInfo {
  std::string name;         // provider identifier (log lines)
  std::string masterKeyId;  // KMIP unique identifier of the master key
  std::string proxyHost;    // HTTP proxy; empty means none
  int64_t proxyPort = 0;
  int64_t connectionTimeout = 0;  // seconds; 0 means 60
  std::string userName;           // KMIP user; empty means no credentials are sent
  std::string password;           // KMIP credential sent with the user name
  std::string clientCertificate;  // PEM; empty means none is presented
  std::string clientPrivateKey;   // PEM
  std::vector<std::string> trustedServerCertificates;  // PEM, in stored order
  std::vector<KmsServer> servers;                      // in configured order

  KmsInfo() = default;
  KmsInfo(const KmsInfo&) = default;
  KmsInfo& operator=(const KmsInfo&) = default;
  // The credential and the private key are secrets: wipe them on release.
  ~KmsInfo() {
    OPENSSL_cleanse(password.data(), password.size());
    OPENSSL_cleanse(clientPrivateKey.data(), clientPrivateKey.size());
  }
};

}  // namespace Zyrd::Kms
