// A provider's client configuration: everything the key server client needs
// to reach the provider's KMIP servers. Read from the configuration store,
// shared by the client and never changed after construction.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/util/secure_buffer.h"

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
  int64_t connectionTimeout = 0;              // seconds; 0 means 60
  std::string userName;                       // KMIP user; empty means no credentials are sent
  Groundwork::SecureString password;          // KMIP credential sent with the user name
  std::string clientCertificate;              // PEM; empty means none is presented
  Groundwork::SecureString clientPrivateKey;  // PEM
  std::vector<std::string> trustedServerCertificates;  // PEM, in stored order
  std::vector<KmsServer> servers;                      // in configured order
};

}  // namespace Zyrd::Kms
