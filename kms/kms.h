// The key server client of one provider: key operations against one of its
// servers at a time (addressed by zero-based index in configured order), the
// certificates servers present, and the provider's cached status.
//
// Implementations are shared by the providers state and by requests in flight
// and are safe to use from any number of threads at once.
#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

#include "errors/kms_result.h"
#include "platform/util/secure_buffer.h"

namespace Zyrd::Kms {

// Trust between the daemon and one server, as the last probe found it.
struct ServerStatus {
  bool clientTrustServer = false;
  bool serverTrustClient = false;
  // Catalogue identifier (client_not_trusting_server / server_not_trusting_client)
  // -> the result that made the flag false.
  std::unordered_map<std::string, KmsResult> errors;
};

struct KmsStatus {
  std::vector<ServerStatus> servers;  // configured order
  bool masterKeyFound = false;
  bool masterKeyUsable = false;
  bool keySizeSupported = false;
  // One entry per server where the master key was looked for without success.
  std::vector<KmsResult> masterKeyErrors;
};

class Kms {
 public:
  virtual ~Kms() = default;

  virtual uint32_t GetServerCount() = 0;
  // A new data key of `keyLength` bytes: its Base64 text and its wrapped text.
  virtual KmsResult GenerateKey(uint32_t server, uint32_t keyLength,
                                Groundwork::SecureString& plainKey, std::string& wrappedKey,
                                std::string& reason) = 0;
  // The Base64 text of the key that `wrappedKey` wraps.
  virtual KmsResult Decrypt(uint32_t server, const std::string& wrappedKey,
                            Groundwork::SecureString& plainKey, std::string& reason) = 0;
  virtual void GetTrustedServerCertificates(std::vector<std::string>& certificates) = 0;
  virtual void GetClientCert(std::string& certificate) = 0;
  virtual int GetServerName(uint32_t server, std::string& name) = 0;
  virtual KmsResult GetRemoteServerCertificate(uint32_t server, std::string& pem,
                                               std::string& reason) = 0;
  // Probes every server and replaces the status cache.
  virtual void UpdateStatus() = 0;
  // The cached status, or a live probe while nothing is cached.
  virtual void GetStatus(KmsStatus& status) = 0;
};

}  // namespace Zyrd::Kms
