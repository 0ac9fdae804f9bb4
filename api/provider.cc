#include "api/provider.h"

#include <fstream>
#include <vector>

#include "api/kms_auth_token_handler.h"
#include "platform/audit/audit.h"
#include "platform/lumo/authn.h"
#include "platform/lumo/authz.h"
#include "platform/lumo/call_registrar.h"
#include "platform/lumo/local_provider.h"
#include "platform/lumo/metadata.h"
#include "platform/ssl/op_id_provider.h"
#include "platform/token/token_handler.h"
#include "platform/util/log.h"
#include "platform/util/panic.h"
#include "platform/util/paths.h"
#include "services/client_certificate_impl.h"
#include "services/credential_impl.h"
#include "services/csr_impl.h"
#include "services/key_operation_impl.h"
#include "services/provider_status_impl.h"
#include "services/providers_impl.h"
#include "services/raw_config_impl.h"
#include "services/remote_impl.h"
#include "services/server_certificates_impl.h"
#include "services/status_impl.h"

namespace Zyrd::ZyrApi {
namespace {

namespace Kms = Com::Tarsel::Orna::Kms;
namespace Metadata = Lumo::Provider::Metadata;
using Lumo::Observer::CallRegistrar;

// Loads one metadata section; a failure stops the process.
template <typename Container, typename LoadFn>
std::shared_ptr<const Container> LoadOrStop(const char* logLine, const std::string& path,
                                            const char* component, LoadFn load) {
  Log_Level(5, logLine, path.c_str());
  auto container = std::make_shared<Container>();
  Lumo::Data::ErrorValuePtr error = load(path, component, *container);
  if (error != nullptr) {
    const std::string text =
        error->Messages().empty() ? error->Name() : error->Messages().front().defaultMessage;
    Log_Level(2, "Error loading file: %s\n", text.c_str());
  }
  VERIFY(error == nullptr);
  return container;
}

std::shared_ptr<const Lumo::Authz::AuthzInfo> LoadAuthzOrStop(
    const std::string& path, const std::shared_ptr<LumoLoggerWrapper>& logger) {
  Log_Level(5, "Loading authz metadata file: %s\n", path.c_str());
  auto info = std::make_shared<Lumo::Authz::AuthzInfo>();
  std::ifstream in(path, std::ios::binary);
  std::vector<std::string> messages;
  bool loaded = in.is_open() && Lumo::Authz::Metadata::LoadAuthzInfoMetadata::Load(
                                    in, *info, logger.get(), messages);
  if (!loaded) Log_Level(2, "Error loading authz metadata file: %s\n", path.c_str());
  VERIFY(loaded);
  return info;
}

}  // namespace

ProviderDependencies DefaultDependencies() {
  ProviderDependencies deps;
  deps.metadataPath = Groundwork::RootPath(kMetadataPath);
  deps.adminTokenPath = Groundwork::RootPath(Orna::Authn::TokenHandler::kDefaultTokenPath);
  return deps;
}

void WriteAuditRecord(const std::map<std::string, std::string>& attributes) {
  auto eventId = attributes.find(CallRegistrar::kEventId);
  auto subject = attributes.find(CallRegistrar::kSubject);
  auto object = attributes.find(CallRegistrar::kObject);
  auto result = attributes.find(CallRegistrar::kResult);
  VERIFY(eventId != attributes.end() && subject != attributes.end() && object != attributes.end() &&
         result != attributes.end());
  std::vector<TslAudit_Attr> others;
  others.reserve(attributes.size() - 3);
  for (const auto& [name, value] : attributes) {
    if (name == CallRegistrar::kEventId || name == CallRegistrar::kSubject ||
        name == CallRegistrar::kObject || name == CallRegistrar::kResult) {
      continue;
    }
    others.push_back({name.c_str(), value.c_str()});
  }
  others.push_back({"", ""});
  TslAudit_LogList(eventId->second.c_str(), subject->second.c_str(), object->second.c_str(),
                   result->second == "true", others.data());
}

Lumo::Provider::ApiProviderPtr CreateLocalProvider(Lumo::Executor executor,
                                                   std::shared_ptr<LumoLoggerWrapper> logger,
                                                   const ProviderDependencies& deps) {
  const std::string& path = deps.metadataPath;
  auto cli = LoadOrStop<Metadata::Cli::MetadataContainer>(
      "Loading cli metadata file: %s\n", path, "zyr_lumo_cli",
      Metadata::ProviderHelper::LoadCliMetadataFile);
  auto metamodel = LoadOrStop<Metadata::Metamodel::MetadataContainer>(
      "Loading metamodel metadata file: %s\n", path, "zyr_lumo_metamodel",
      Metadata::ProviderHelper::LoadMetamodelMetadataFile);
  auto authn = LoadOrStop<Metadata::Authentication::MetadataContainer>(
      "Loading authn metadata file: %s\n", path, "zyr_lumo_authentication",
      Metadata::ProviderHelper::LoadAuthnMetadataFile);
  auto authzInfo = LoadAuthzOrStop(path, logger);
  VERIFY(deps.providers != nullptr && deps.firewall != nullptr && deps.clock != nullptr &&
         deps.stats != nullptr);

  // The daemon's services, in binding order.
  namespace P = Kms::Providers;
  const auto& providers = deps.providers;
  std::vector<Lumo::Provider::ApiInterfacePtr> interfaces = {
      Kms::KeyOperationSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<Kms::KeyOperationSvc::KeyOperationImpl>(providers, *deps.stats)),
      P::ServerCertificatesSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<P::ServerCertificatesSvc::ServerCertificatesImpl>(providers)),
      P::ServerCertificates::RemoteSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<P::ServerCertificates::RemoteSvc::RemoteImpl>(providers)),
      P::ClientCertificate::CsrSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<P::ClientCertificate::CsrSvc::CsrImpl>(providers)),
      Kms::ProvidersSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<Kms::ProvidersSvc::ProvidersImpl>(providers, *deps.firewall)),
      P::CredentialSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<P::CredentialSvc::CredentialImpl>(providers)),
      P::ClientCertificateSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<P::ClientCertificateSvc::ClientCertificateImpl>(providers)),
      Kms::RawConfigSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<Kms::RawConfigSvc::RawConfigImpl>(providers)),
      P::StatusSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<P::StatusSvc::StatusImpl>(providers)),
      Kms::StatusSvc::AsyncServiceBinder::BindImplementation(
          std::make_shared<Kms::StatusSvc::StatusImpl>()),
  };
  for (auto& iface : Metadata::CliInterfaces(cli)) interfaces.push_back(std::move(iface));
  for (auto& iface : Metadata::MetamodelInterfaces(metamodel))
    interfaces.push_back(std::move(iface));
  for (auto& iface : Metadata::AuthnInterfaces(authn)) interfaces.push_back(std::move(iface));

  auto local = std::make_shared<Lumo::Provider::AsyncLocalProvider>(executor, std::move(interfaces),
                                                                    metamodel);
  Lumo::Provider::ApiProviderPtr provider = std::make_shared<Lumo::Authz::Filter::AsyncAuthzFilter>(
      local, authzInfo, std::make_shared<OrnaToken::Authz::JwtEntitlementCheckerImpl>(), logger,
      [local](const std::string& method) { return local->HasOperation(method); });

  // Token handlers, outermost first; wrapped from the last to the first.
  std::vector<std::shared_ptr<Lumo::Authn::AuthnHandler>> handlers = {
      std::make_shared<Authn::KmsAuthTokenHandler>(deps.readVouchdPublicKey, *deps.clock),
      std::make_shared<Orna::Authn::TokenHandler>(deps.adminTokenPath),
  };
  for (auto it = handlers.rbegin(); it != handlers.rend(); ++it) {
    provider = std::make_shared<Lumo::Authn::Filter::AsyncAuthnFilter>(provider, *it);
  }
  provider = std::make_shared<Kestrel::Common::StrakeLumo::OpIdProvider>(provider);
  return std::make_shared<CallRegistrar>(provider, WriteAuditRecord);
}

}  // namespace Zyrd::ZyrApi
