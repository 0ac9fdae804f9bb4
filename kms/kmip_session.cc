// KmipKms: session descriptions, connecting, performing commands, and the
// certificates that servers present.
#include <cinttypes>
#include <cstdio>

#include "kms/kmip_kms.h"
#include "platform/kmip/qlkmipsimple.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/hex.h"
#include "platform/util/log.h"

namespace Zyrd::Kms {
namespace {

constexpr const char* kCredentialOptions = ", Options={Authentication={User=%s, Password=%s}}";

void AppendStandardizedCert(Groundwork::SecureString& out, std::string cert,
                            const char* warning) {
  if (!Kestrel::Common::SslUtils::StandardizePemCert(cert)) {
    Log_Level(3, "%s", warning);
  }
  out.str().append(", Trusted_Cert=PEM:[");
  Groundwork::AppendHex(cert, out.str());
  out.str().append("]");
}

}  // namespace

KmsResult MapKmipError(int error) {
  switch (error) {
    case 0: return Ok;
    case kKmipErrorCommunication: return KeyServerCommunicationError;
    case kKmipErrorTimeout: return KeyServerTimeout;
    default: return KmipFailure;
  }
}

KmipKms::KmipKms(std::shared_ptr<const KmsInfo> info)
    : info_(std::move(info)), lock_("", 0xfeffffff) {}

KmipKms::~KmipKms() = default;

uint32_t KmipKms::GetServerCount() { return static_cast<uint32_t>(info_->servers.size()); }

void KmipKms::GetTrustedServerCertificates(std::vector<std::string>& certificates) {
  certificates = info_->trustedServerCertificates;
}

void KmipKms::GetClientCert(std::string& certificate) {
  certificate = info_->clientCertificate;
}

int KmipKms::GetServerName(uint32_t server, std::string& name) {
  if (server >= info_->servers.size()) {
    name.clear();
    return 1;
  }
  name = info_->servers[server].name;
  return 0;
}

const std::string& KmipKms::ServerName(uint32_t server) const {
  static const std::string kUnknown = "<none>";
  return server < info_->servers.size() ? info_->servers[server].name : kUnknown;
}

bool KmipKms::HasServer(uint32_t server, std::string& reason) const {
  if (server < info_->servers.size()) return true;
  reason = "No server with index " + std::to_string(server);
  return false;
}

Groundwork::SecureString KmipKms::BuildSession(uint32_t server, bool withTrust,
                                               const std::string& trustedCert) const {
  const KmsServer& s = info_->servers.at(server);
  Log_Level(5, "Create client context for server %s: %ld\n", s.hostname.c_str(),
            static_cast<long>(s.port));

  Groundwork::SecureString desc;
  auto& out = desc.str();
  out.append("Presentation={Protocol=KMIP, Version='1.1', Format=TTLV}, Session = {");
  if (!info_->proxyHost.empty()) {
    out.append("Proxy={Protocol=HTTP, Host='").append(info_->proxyHost);
    out.append("', Port='").append(std::to_string(info_->proxyPort)).append("'},");
  }
  out.append("Protocol=SSL, Host='").append(s.hostname);
  out.append("', Port='").append(std::to_string(s.port)).append("', ");
  int64_t timeout = info_->connectionTimeout == 0 ? 60 : info_->connectionTimeout;
  out.append("Timeout=").append(std::to_string(timeout)).append(":Seconds, ");
  if (!info_->clientCertificate.empty()) {
    std::string cert = info_->clientCertificate;
    if (!Kestrel::Common::SslUtils::StandardizePemCert(cert)) {
      Log_Level(3, "Could not standardize client certificate.\n");
    }
    std::string certHex = Groundwork::HexEncode(cert);
    out.append("Certificate=PEM:[").append(certHex).append("], Public=PEM:[").append(certHex);
    out.append("], Private=PEM:[");
    Groundwork::AppendHex(info_->clientPrivateKey.view(), out);  // straight into wiping memory
    out.append("],");
  }
  out.append("User_Trust, Authenticate}");
  if (withTrust) {
    if (!trustedCert.empty()) {
      AppendStandardizedCert(desc, trustedCert, "Could not standardize trusted server certificate.\n");
    } else {
      for (const auto& cert : info_->trustedServerCertificates) {
        AppendStandardizedCert(desc, cert, "Could not standardize server certificate.\n");
      }
    }
  }
  return desc;
}

KmsResult KmipKms::Connect(qlc_session*& session, uint32_t server, std::string& reason) {
  Groundwork::SecureString desc = BuildSession(server, true, "");
  qlc_result* result = qlc_connect_key_manager(&session, desc.data());
  int n = qlc_ok(result);
  if (n != 0) {
    reason = qlc_explain(result);
    Log_Level(2, "Failed to connect to key server, %s\n", reason.c_str());
    session = nullptr;
  }
  qlc_release(result);
  return MapKmipError(n);
}

KmsResult KmipKms::Perform(qlc_session* session, const std::string& keyId, const char* command,
                           std::string& reason, qlc_result** out) {
  qlc_result* result;
  if (!info_->userName.empty()) {
    std::string withOptions = std::string(command) + kCredentialOptions;
    result = qlc_perform(session, withOptions.c_str(), keyId.c_str(), info_->userName.c_str(),
                         info_->password.data());
  } else {
    result = qlc_perform(session, command, keyId.c_str());
  }
  int n = qlc_ok(result);
  if (n != 0) {
    reason = qlc_explain(result);
    Log_Level(2, "%s failed on key %s, %s\n", command, keyId.c_str(), reason.c_str());
    qlc_release(result);
  } else if (out != nullptr) {
    *out = result;
  } else {
    qlc_release(result);
  }
  return MapKmipError(n);
}

KmsResult KmipKms::FetchServerCertificate(uint32_t server, std::string& pem, std::string& reason) {
  if (!HasServer(server, reason)) return OtherFailure;
  Log_Level(6, "Fetching remote server cert\n");
  qlc_session* session = nullptr;
  Groundwork::SecureString desc = BuildSession(server, false, "");
  qlc_result* result = qlc_connect_key_manager(&session, desc.data());
  int n = qlc_ok(result);
  KmsResult r;
  if (n == kKmipErrorUntrusted) {
    qlc_server_credentials* credentials = nullptr;
    int ret = qlc_fetch_server_credentials(result, &credentials);
    if (ret != 0) {
      reason = qlc_explain(result);
      Log_Level(2, "Failed to fetch server cert: ret = %d reason = %s\n", ret, reason.c_str());
      r = MapKmipError(ret);
    } else if (credentials->format != 1 && credentials->format != 4) {
      Log_Level(2, "Unknown certificate format %d\n", credentials->format);
      reason = "Invalid certificate format";
      r = CertFormatUnknown;
    } else {
      pem.assign(reinterpret_cast<const char*>(credentials->data), credentials->length);
      r = Ok;
    }
    if (credentials != nullptr) qlc_free_credentials(credentials);
  } else if (n == 0) {
    reason =
        "Client unexpectedly connected to key management server without any trusted server "
        "certificate";
    qlc_disconnect_key_manager(session);
    r = ServerCertNotRequired;
  } else {
    reason = qlc_explain(result);
    r = MapKmipError(n);
  }
  qlc_release(result);

  if (r != Ok) {
    Log_Level(2, "Failed to fetch server certificate from key server %s: %s\n",
              ServerName(server).c_str(), reason.c_str());
    return r;
  }
  namespace SslUtils = Kestrel::Common::SslUtils;
  if (!SslUtils::StandardizePemString(SslUtils::kCertificateHeader, SslUtils::kCertificateFooter,
                                      pem)) {
    Log_Level(3, "Failed to standardize server certificate of key server %s\n",
              ServerName(server).c_str());
  }
  return Ok;
}

KmsResult KmipKms::GetRemoteServerCertificate(uint32_t server, std::string& pem,
                                              std::string& reason) {
  {
    UserLock::ReadGuard guard(*lock_);
    if (statusValid_ && server < remoteCerts_.size() && !remoteCerts_[server].empty()) {
      pem = remoteCerts_[server];
      Log_Level(6, "Provider %s using cached remote server cert for server %s\n",
                info_->name.c_str(), ServerName(server).c_str());
      return Ok;
    }
  }
  return FetchServerCertificate(server, pem, reason);
}

}  // namespace Zyrd::Kms
