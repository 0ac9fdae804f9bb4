// The KMIP key server client of one provider.
//
// Every operation that needs a server opens a fresh TLS session to it through
// the KMIP client library, performs its commands and disconnects; no session
// outlives one operation. The status cache (master key, its state, the
// provider's KmsStatus and the certificates the servers present) is replaced
// by UpdateStatus, under the client's lock, and read under it by the key
// operations; no KMIP call and no cryptography ever runs under the lock.
//
// A key operation that finds no master key cached reads it from its server
// once for every caller waiting at that moment (the others wait for that read
// and share its outcome), and keeps a key it found, unless destroyed, in the
// cache until the next UpdateStatus replaces it. A failed read is not kept.
//
// Thread-safe: any number of requests and the scheduled status update may use
// one client at once.
#pragma once

#include <condition_variable>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "kms/kms.h"
#include "kms/kms_info.h"
#include "platform/util/secure_buffer.h"
#include "platform/util/userlock.h"

#include "platform/kmip/qlkmipsimple.h"

namespace Zyrd::Kms {

inline constexpr int kKmipErrorCommunication = 75;
inline constexpr int kKmipErrorTimeout = 105;
inline constexpr int kKmipErrorUntrusted = 110;

// KMIP State attribute values; -1 when unknown.
inline constexpr int32_t kKeyStateUnknown = -1;

// Destroyed or destroyed-compromised: such a key is never kept in a cache.
inline bool IsKeyDestroyed(int32_t state) { return state == 5 || state == 6; }

// Supported master key sizes in bits, in the order the status reason lists them.
inline constexpr int kSupportedKeySizes[] = {128, 256};

// Library error number -> result: 0 Ok, 75 KeyServerCommunicationError,
// 105 KeyServerTimeout, anything else KmipFailure.
KmsResult MapKmipError(int error);

// KMIP key state -> result with its reason text (Ok for states 2, 0, 7+ and
// below -1).
KmsResult CheckKeyState(int32_t state, std::string& reason);

struct MasterKeyFlags {
  bool found = false;
  bool usable = false;
  bool sizeSupported = false;
};

// Judges a master key of `length` bytes in `state` for the status probe.
KmsResult CheckMasterKey(size_t length, int32_t state, MasterKeyFlags& flags, std::string& reason);

// Whether a server's version text names a KMIP version this client speaks:
// a decimal "1.x" with x not below "1" in text order ("1.1", "1.4", "1.10").
bool IsVersionSupported(const std::string& version);

class KmipKms final : public Kms {
 public:
  explicit KmipKms(std::shared_ptr<const KmsInfo> info);
  ~KmipKms() override;
  KmipKms(const KmipKms&) = delete;
  KmipKms& operator=(const KmipKms&) = delete;

  uint32_t GetServerCount() override;
  KmsResult GenerateKey(uint32_t server, uint32_t keyLength, Groundwork::SecureString& plainKey,
                        std::string& wrappedKey, std::string& reason) override;
  KmsResult Decrypt(uint32_t server, const std::string& wrappedKey,
                    Groundwork::SecureString& plainKey, std::string& reason) override;
  void GetTrustedServerCertificates(std::vector<std::string>& certificates) override;
  void GetClientCert(std::string& certificate) override;
  int GetServerName(uint32_t server, std::string& name) override;
  KmsResult GetRemoteServerCertificate(uint32_t server, std::string& pem,
                                       std::string& reason) override;
  void UpdateStatus() override;
  void GetStatus(KmsStatus& status) override;

  // The session description for server `server`: with `withTrust` the
  // trusted certificates are sent (`trustedCert` alone when it is not empty,
  // else the configured list). It carries the client's private key, hence
  // the wiping string.
  Groundwork::SecureString BuildSession(uint32_t server, bool withTrust,
                                        const std::string& trustedCert) const;

  // The master key `keyId` (from the cache when it is the provider's key and
  // the cache holds it) and its state (from the cache unless `refreshState`,
  // or when the cache does not know it).
  KmsResult GetMasterKey(uint32_t server, const std::string& keyId, bool refreshState,
                         Groundwork::SecureBytes& key, int32_t& state, std::string& reason);

  // The KMIP versions server `server` announces. With `alwaysTrustServer`, a
  // server that the configured certificates do not vouch for is retried
  // trusting `remoteCert` alone.
  KmsResult DiscoverVersions(uint32_t server, bool alwaysTrustServer,
                             const std::string& remoteCert, std::string& reason,
                             std::vector<std::string>& versions);

  // The certificate server `server` presents, fetched without trusting it.
  // Like every operation that takes a server index, OtherFailure for an
  // index beyond the configured servers.
  KmsResult FetchServerCertificate(uint32_t server, std::string& pem, std::string& reason);

 private:
  struct ProbeResult;
  struct KeyRead;

  // The master key and its state from the server (only the state when `key`
  // holds the key already).
  KmsResult ReadMasterKey(uint32_t server, const std::string& keyId,
                          Groundwork::SecureBytes& key, int32_t& state, std::string& reason);
  // ReadMasterKey of the configured key, shared with the callers that wait
  // for the same server meanwhile; fills the cache.
  KmsResult ReadSharedMasterKey(uint32_t server, Groundwork::SecureBytes& key, int32_t& state,
                                std::string& reason);
  const std::string& ServerName(uint32_t server) const;
  // Whether `server` indexes a configured server; when not, `reason` says so.
  bool HasServer(uint32_t server, std::string& reason) const;
  KmsResult Connect(qlc_session*& session, uint32_t server, std::string& reason);
  KmsResult Perform(qlc_session* session, const std::string& keyId, const char* command,
                    std::string& reason, qlc_result** out);
  KmsResult GetKeyState(qlc_session* session, const std::string& keyId, int32_t& state,
                        std::string& reason);
  void Probe(ProbeResult& result);

  const std::shared_ptr<const KmsInfo> info_;

  UserLock::RWLockPtr lock_;  // guards everything below
  Groundwork::SecureBytes cachedKey_;
  int32_t cachedState_ = kKeyStateUnknown;
  KmsStatus cachedStatus_;
  std::vector<std::string> remoteCerts_;
  bool statusValid_ = false;

  std::mutex readsMutex_;  // guards reads_; never held with lock_
  std::condition_variable readDone_;
  std::map<uint32_t, std::shared_ptr<KeyRead>> reads_;  // in flight, by server
};

}  // namespace Zyrd::Kms
