#include "services/provider_status_impl.h"

#include "errors/error_builders.h"
#include "errors/kms_result.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc {
namespace {

namespace SslUtils = Kestrel::Common::SslUtils;
using Zyrd::Kms::KmsResult;
using Messages = std::vector<::Lumo::L10n::LocalizableMessage>;

constexpr const char* kOperation = "providers.statussvc.get";
constexpr const char* kPrefix = "com.tarsel.orna.kms.providers.statussvc.";

// Formats messages with the caller's localizer.
class MessageMaker {
 public:
  explicit MessageMaker(const ::Lumo::L10n::Localizer& localizer) : localizer_(localizer) {}

  ::Lumo::L10n::LocalizableMessage Make(const std::string& id,
                                        const std::vector<::Lumo::MsgArgument>& args = {}) const {
    ::Lumo::NamedMessageBuilder builder(id);
    for (const auto& arg : args) builder.Arg(arg.name, arg.value);
    return ::Lumo::L10n::LocalizableMessageHelpers::formatMessage(localizer_, builder);
  }
  // The message of a key server result, naming the server.
  ::Lumo::L10n::LocalizableMessage ForResult(KmsResult result, const std::string& server) const {
    return Make(Zyrd::ZyrApi::KmsErrorId(result, kOperation), {{"server", server}});
  }

 private:
  const ::Lumo::L10n::Localizer& localizer_;
};

// The trust messages of one server: each flag that is false, followed by
// the result that made it false.
void AddTrustMessages(const Zyrd::Kms::ServerStatus& status, const std::string& name,
                      const MessageMaker& make, Messages& messages) {
  for (const auto& [trusted, id] :
       {std::pair{status.clientTrustServer, std::string(kPrefix) + "client_not_trusting_server"},
        std::pair{status.serverTrustClient, std::string(kPrefix) + "server_not_trusting_client"}}) {
    if (trusted) continue;
    messages.push_back(make.Make(id, {{"server", name}}));
    auto error = status.errors.find(id);
    messages.push_back(make.ForResult(
        error != status.errors.end() ? error->second : Zyrd::Kms::OtherFailure, name));
  }
}

// The health of server `index` that trusts and is trusted, adding why it is
// not healthy to `messages`.
Health EvaluateTrustedServer(Zyrd::Kms::Kms& client, uint32_t index, const std::string& name,
                             const std::vector<std::string>& trustedCerts, const MessageMaker& make,
                             Messages& messages) {
  if (trustedCerts.empty()) {
    messages.push_back(make.Make(std::string(kPrefix) + "trusted_server_certificates.unknown"));
    return Health::WARNING;
  }
  std::string pem;
  std::string reason;
  KmsResult r = client.GetRemoteServerCertificate(index, pem, reason);
  if (r != Zyrd::Kms::Ok) {
    messages.push_back(
        make.Make(std::string(kPrefix) + "server_certificate_unknown_expiry", {{"server", name}}));
    messages.push_back(make.ForResult(r, name));
    return Health::WARNING;
  }
  for (const auto& trusted : trustedCerts) {
    if (!SslUtils::ComparePemCerts(trusted, pem)) continue;
    int64_t days = 0;
    if (!SslUtils::GetPemCertDaysToExpire(pem, days)) break;
    if (days > StatusImpl::kExpiryWarningDays) return Health::HEALTHY;
    messages.push_back(make.Make(std::string(kPrefix) + "server_certificate_expiring",
                                 {{"days", std::to_string(days)}}));
    return Health::WARNING;
  }
  return Health::HEALTHY;
}

}  // namespace

StatusImpl::StatusImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void StatusImpl::get(const std::string& provider, const ::Lumo::Core::AsyncActivation& activation,
                     ::Lumo::AsyncResult<Info> result) {
  if (provider.empty()) {
    Log_Level(2, "Unable to get status for an empty provider\n");
    return result.SetError(Zyrd::ZyrApi::MakeInvalidArgumentError({}));
  }
  std::shared_ptr<Zyrd::Kms::Kms> client = providers_->GetProvider(provider);
  if (client == nullptr) return result.SetError(Zyrd::ZyrApi::MakeNotFoundError({}));
  const bool attestationCaller =
      activation.authData != nullptr && activation.authData->username == "<ATTEST>";
  const MessageMaker make(*activation.requestLocalizer);

  const uint32_t count = client->GetServerCount();
  std::vector<std::string> trustedCerts;
  client->GetTrustedServerCertificates(trustedCerts);
  if (trustedCerts.empty()) {
    Log_Level(2, "Unable to get trusted certificates for provider %s\n", provider.c_str());
  }
  Zyrd::Kms::KmsStatus status;
  client->GetStatus(status);

  Info info;
  bool allWarning = true;
  for (uint32_t i = 0; i < count; ++i) {
    ServerInfo server;
    client->GetServerName(i, server.name);
    // A probe reports every server; a status without this one trusts nothing.
    const Zyrd::Kms::ServerStatus trust =
        i < status.servers.size() ? status.servers[i] : Zyrd::Kms::ServerStatus{};
    server.clientTrustServer = trust.clientTrustServer;
    server.serverTrustClient = trust.serverTrustClient;
    AddTrustMessages(trust, server.name, make, server.messages);
    server.health =
        trust.clientTrustServer && trust.serverTrustClient
            ? EvaluateTrustedServer(*client, i, server.name, trustedCerts, make, server.messages)
            : Health::ERROR;
    allWarning = allWarning && server.health == Health::WARNING;
    if (i < status.masterKeyErrors.size()) {
      info.messages.push_back(make.ForResult(status.masterKeyErrors[i], server.name));
    }
    if (!attestationCaller) info.servers.push_back(std::move(server));
  }

  std::string clientCert;
  client->GetClientCert(clientCert);
  int64_t days = 0;
  if (!(status.masterKeyFound && status.masterKeyUsable && status.keySizeSupported)) {
    Log_Level(2, "Master key is not available in any server of the provider %s\n",
              provider.c_str());
    info.health = Health::ERROR;
  } else if (allWarning) {
    Log_Level(2, "All servers of the provider are warning %s\n", provider.c_str());
    info.health = Health::WARNING;
  } else if (clientCert.empty() || !SslUtils::GetPemCertDaysToExpire(clientCert, days)) {
    info.messages.push_back(make.Make(std::string(kPrefix) + "client_certificate_unknown_expiry"));
    info.health = Health::WARNING;
  } else if (days > kExpiryWarningDays) {
    info.health = Health::HEALTHY;
  } else {
    info.messages.push_back(make.Make(std::string(kPrefix) + "client_certificate_expiring",
                                      {{"days", std::to_string(days)}}));
    info.health = Health::WARNING;
  }
  result.SetResult(info);
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::StatusSvc
