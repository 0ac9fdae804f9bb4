// KmipKms: version discovery, the status probe and the status cache.
#include <boost/algorithm/string/predicate.hpp>

#include "kms/kmip_kms.h"
#include "platform/kmip/qlkmipsimple.h"
#include "platform/util/log.h"

namespace Zyrd::Kms {
namespace {

constexpr const char* kClientNotTrustingServer =
    "com.tarsel.orna.kms.providers.statussvc.client_not_trusting_server";
constexpr const char* kServerNotTrustingClient =
    "com.tarsel.orna.kms.providers.statussvc.server_not_trusting_client";

bool IsDecimal(std::string_view text) {
  bool digits = false;
  bool dot = false;
  for (char c : text) {
    if (c >= '0' && c <= '9') {
      digits = true;
    } else if (c == '.' && !dot) {
      dot = true;
    } else {
      return false;
    }
  }
  return digits;
}

}  // namespace

bool IsVersionSupported(const std::string& version) {
  // Version texts are expected to be decimal numbers; anything else counts as
  // a version this client does not speak.
  if (!IsDecimal(version)) return false;
  size_t dot = version.find('.');
  if (dot == std::string::npos) return false;
  std::string major = version.substr(0, dot);
  std::string minor = version.substr(dot + 1);
  return boost::iequals(major, "1") && minor.compare("1") >= 0;
}

// A probe's findings: the status that is reported, plus the master key and
// the certificates that go into the cache.
struct KmipKms::ProbeResult {
  KmsStatus status;
  Groundwork::SecureBytes key;
  int32_t state = kKeyStateUnknown;
  std::vector<std::string> remoteCerts;
};

KmsResult KmipKms::DiscoverVersions(uint32_t server, bool alwaysTrustServer,
                                    const std::string& remoteCert, std::string& reason,
                                    std::vector<std::string>& versions) {
  if (!HasServer(server, reason)) return OtherFailure;
  const char* name = ServerName(server).c_str();
  qlc_session* session = nullptr;
  qlc_result* result = qlc_connect_key_manager(&session, BuildSession(server, true, "").data());
  int n = qlc_ok(result);
  if (n == kKmipErrorUntrusted && alwaysTrustServer) {
    qlc_release(result);
    if (remoteCert.empty()) return KmipFailure;
    session = nullptr;
    result = qlc_connect_key_manager(&session, BuildSession(server, true, remoteCert).data());
    n = qlc_ok(result);
  }
  if (n != 0) {
    reason = qlc_explain(result);
    Log_Level(2, "Failed to connect to key server %s: %s\n", name, reason.c_str());
    qlc_release(result);
    return MapKmipError(n);
  }
  qlc_release(result);

  qlc_result* response = qlc_perform(session, "Query, Versions");
  KmsResult r = Ok;
  if (int m = qlc_ok(response); m != 0) {
    reason = qlc_explain(response);
    Log_Level(2, "Failed to query versions in key server %s: %s\n", name, reason.c_str());
    r = MapKmipError(m);
  } else if (qlc_find("Versions", response) == nullptr) {
    Log_Level(2, "Key server %s did not return version information\n", name);
    reason = "Key server did not return any version";
    r = NoVersionsFound;
  } else {
    versions.clear();
    bool supported = false;
    for (const qlc_node* node = qlc_find("Versions/", response); node != nullptr;
         node = qlc_next(node)) {
      char* text = nullptr;
      if (int k = qlc_value_of(nullptr, node, "%s", &text); k != 0) {
        Log_Level(2, "Failed to get version from the response of key server %s: %d\n", name, k);
        reason = "Failed to get version from the key server";
        r = MapKmipError(k);
        break;
      }
      Log_Level(5, "Found server version %s for key server %s\n", text, name);
      versions.emplace_back(text);
      supported = supported || IsVersionSupported(versions.back());
      qlc_free(text);
    }
    if (!supported) {
      reason = "Key server version not supported";
      r = NoSupportedVersions;
    }
  }
  qlc_disconnect_key_manager(session);
  qlc_release(response);
  return r;
}

void KmipKms::Probe(ProbeResult& result) {
  const char* provider = info_->name.c_str();
  result.status.masterKeyFound = false;
  result.status.masterKeyUsable = false;
  result.status.keySizeSupported = false;
  result.state = kKeyStateUnknown;

  for (uint32_t i = 0; i < info_->servers.size(); ++i) {
    const char* server = ServerName(i).c_str();
    ServerStatus s;
    std::string cert;
    std::string reason;
    std::vector<std::string> versions;

    if (FetchServerCertificate(i, cert, reason) != Ok) {
      Log_Level(2, "Failed to get remote server cert for server %s of provider %s\n", server,
                provider);
      cert.clear();
      reason.clear();
    }
    bool healthy = false;
    KmsResult r1 = DiscoverVersions(i, false, cert, reason, versions);
    if (r1 == Ok) {
      s.clientTrustServer = true;
      s.serverTrustClient = true;
      healthy = true;
    } else {
      Log_Level(2,
                "DiscoverVersions(alwaysTrustServer=False) failed for server %s of provider %s: "
                "%s\n",
                server, provider, reason.c_str());
      s.clientTrustServer = false;
      s.errors[kClientNotTrustingServer] = r1;
      KmsResult r2 = DiscoverVersions(i, true, cert, reason, versions);
      if (r2 == Ok) {
        s.serverTrustClient = true;
      } else {
        Log_Level(2,
                  "DiscoverVersions(alwaysTrustServer=True) failed for server %s of provider %s: "
                  "%s\n",
                  server, provider, reason.c_str());
        s.serverTrustClient = false;
        s.errors[kServerNotTrustingClient] = r2;
      }
    }
    Log_Level(6,
              "Status update - provider: %s server: %s serverTrustClient: %d clientTrustServer: "
              "%d\n",
              provider, server, s.serverTrustClient ? 1 : 0, s.clientTrustServer ? 1 : 0);

    if (!result.status.masterKeyFound) {
      if (healthy) {
        // Each attempt starts from nothing: bytes left by a failed attempt on
        // an earlier server must never pass for the cached key.
        Groundwork::Wipe(result.key);
        KmsResult r =
            GetMasterKey(i, info_->masterKeyId, true, result.key, result.state, reason);
        MasterKeyFlags flags;
        if (r == Ok) {
          std::string checkReason;
          r = CheckMasterKey(result.key.size(), result.state, flags, checkReason);
          if (reason.empty()) reason = checkReason;
          result.status.masterKeyFound = flags.found;
          result.status.masterKeyUsable = flags.usable;
          result.status.keySizeSupported = flags.sizeSupported;
          Log_Level(6, "Provider %s status update master key found %s usable %s size supported %s\n",
                    provider, flags.found ? "true" : "false", flags.usable ? "true" : "false",
                    flags.sizeSupported ? "true" : "false");
        }
        if (flags.found && flags.usable && flags.sizeSupported) {
          result.status.masterKeyErrors.clear();
          Log_Level(6, "Provider %s status update master key state %d\n", provider, result.state);
        } else {
          Log_Level(3, "Master key is not available in server %s of provider %s: %s\n", server,
                    provider, reason.c_str());
          result.status.masterKeyErrors.push_back(r);
        }
      } else {
        Log_Level(3, "Key server %s of provider %s is unhealthy\n", server, provider);
        result.status.masterKeyErrors.push_back(MasterKeyNotFound);
      }
    }
    result.status.servers.push_back(std::move(s));
    result.remoteCerts.push_back(std::move(cert));
  }

  if (!result.status.masterKeyFound || IsKeyDestroyed(result.state)) {
    Log_Level(6, "Master key not found or already destroyed, clearing cache. Provider %s key %s\n",
              provider, info_->masterKeyId.c_str());
    Groundwork::Wipe(result.key);
  }
}

void KmipKms::UpdateStatus() {
  Log_Level(6, "Provider %s update status\n", info_->name.c_str());
  ProbeResult probe;
  Probe(probe);
  UserLock::WriteGuard guard(*lock_);
  cachedKey_.swap(probe.key);
  cachedState_ = probe.state;
  cachedStatus_ = std::move(probe.status);
  remoteCerts_ = std::move(probe.remoteCerts);
  statusValid_ = true;
  // The previous key, now in `probe.key`, is wiped when the probe goes.
}

void KmipKms::GetStatus(KmsStatus& status) {
  {
    UserLock::ReadGuard guard(*lock_);
    if (statusValid_) {
      status = cachedStatus_;
      Log_Level(6, "Provider %s getting status from cache\n", info_->name.c_str());
      return;
    }
  }
  Log_Level(6, "Provider %s getting status from server\n", info_->name.c_str());
  ProbeResult probe;
  Probe(probe);
  status = std::move(probe.status);
}

}  // namespace Zyrd::Kms
