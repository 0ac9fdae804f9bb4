#include "services/remote_impl.h"

#include "errors/error_builders.h"
#include "errors/kms_result.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc {

RemoteImpl::RemoteImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers)
    : providers_(std::move(providers)) {}

void RemoteImpl::list(const std::string& provider, const std::optional<FilterSpec>& spec,
                      const ::Lumo::Core::AsyncActivation& activation,
                      ::Lumo::AsyncResult<std::vector<Summary>> result) {
  if (provider.empty()) {
    Log_Level(2, "List server certificates failed: Empty provider ID\n");
    return result.SetError(Zyrd::ZyrApi::MakeInvalidArgumentError({}));
  }
  std::shared_ptr<Zyrd::Kms::Kms> client = providers_->GetProvider(provider);
  if (client == nullptr) return result.SetError(Zyrd::ZyrApi::MakeNotFoundError({}));

  std::vector<std::string> trustedCerts;
  client->GetTrustedServerCertificates(trustedCerts);
  const uint32_t count = client->GetServerCount();
  std::vector<Summary> summaries;
  for (uint32_t i = 0; i < count; ++i) {
    Summary summary;
    client->GetServerName(i, summary.server);
    if (spec && spec->servers && spec->servers->count(summary.server) == 0) continue;
    std::string pem;
    std::string reason;
    Zyrd::Kms::KmsResult r = client->GetRemoteServerCertificate(i, pem, reason);
    if (r == Zyrd::Kms::Ok) {
      for (const auto& trusted : trustedCerts) {
        if (Kestrel::Common::SslUtils::ComparePemCerts(pem, trusted)) {
          summary.trusted = true;
          break;
        }
      }
      summary.certificate = std::move(pem);
    } else {
      ::Lumo::NamedMessageBuilder message(
          Zyrd::ZyrApi::KmsErrorId(r, "providers.server_certificates.remotesvc.list"));
      message.Arg("server", summary.server);
      summary.messages.push_back(::Lumo::L10n::LocalizableMessageHelpers::formatMessage(
          *activation.requestLocalizer, message));
    }
    if (spec && spec->trusted && *spec->trusted != summary.trusted) continue;
    summaries.push_back(std::move(summary));
  }
  result.SetResult(summaries);
}

}  // namespace Com::Tarsel::Orna::Kms::Providers::ServerCertificates::RemoteSvc
