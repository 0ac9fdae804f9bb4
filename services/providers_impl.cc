#include "services/providers_impl.h"

#include "config/config_lock.h"
#include "config/provider_config.h"
#include "errors/error_builders.h"
#include "platform/ssl/firewall_utils.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::ProvidersSvc {
namespace {

namespace Config = Zyrd::Config;
using Zyrd::ZyrApi::Message;
using ErrorPtr = ::Lumo::Data::ErrorValuePtr;

constexpr const char* kServersParam = "spec.keyServer.kmipServer.servers";
constexpr const char* kServerNameParam = "spec.keyServer.kmipServer.servers.server.Name";
constexpr const char* kServerHostParam = "spec.keyServer.kmipServer.servers.server.adress.hostname";
constexpr const char* kServerPortParam = "spec.keyServer.kmipServer.servers.server.adress.port";
constexpr const char* kProxyHostParam = "spec.keyServer.proxyServer.hostname";
constexpr const char* kProxyPortParam = "spec.keyServer.proxyServer.port";

ErrorPtr FirewallError() {
  return Zyrd::ZyrApi::MakeError({Message("com.tarsel.orna.kms.providers.firewall_error")});
}

bool ValidPort(const std::optional<int64_t>& port) {
  return !port || (*port >= 1 && *port <= 65535);
}

// The parameter a proxy fails on, or null. Its hostname becomes a line of
// the firewall ruleset, so blanks and control characters are refused.
const char* CheckProxy(const NetworkAddress& proxy) {
  if (!Kestrel::Common::FirewallUtils::IsValidHostname(proxy.hostname)) return kProxyHostParam;
  if (!ValidPort(proxy.port)) return kProxyPortParam;
  return nullptr;
}

// The parameter a server list fails on, or null.
const char* CheckServers(const std::vector<Server>& servers, const std::string* proxyHost) {
  if (servers.empty()) return kServersParam;
  for (size_t i = 0; i < servers.size(); ++i) {
    const Server& server = servers[i];
    const std::string& host = server.address.hostname;
    bool nameSeen = false;
    bool hostSeen = false;
    for (size_t j = 0; j < i; ++j) {
      nameSeen = nameSeen || servers[j].name == server.name;
      hostSeen = hostSeen || servers[j].address.hostname == host;
    }
    if (server.name.empty() || nameSeen) return kServerNameParam;
    if (host.empty() || (proxyHost != nullptr && host == *proxyHost) || hostSeen ||
        !Kestrel::Common::FirewallUtils::IsValidHostname(host)) {
      return kServerHostParam;
    }
    if (!ValidPort(server.address.port)) return kServerPortParam;
  }
  return nullptr;
}

const char* CheckCreate(const CreateSpec& spec) {
  const KeyServerCreateSpec& ks = spec.keyServer;
  if (spec.provider.empty()) return "spec.provider";
  if (spec.masterKeyId.empty()) return "spec.masterKeyId";
  if (ks.type.value != KeyServerType::KMIP) return "spec.keyServer.type";
  if (ks.description && ks.description->empty()) return "spec.keyServer.description";
  if (ks.kmipServer.username && ks.kmipServer.username->empty()) {
    return "spec.keyServer.kmipServer.username";
  }
  if (ks.proxyServer) {
    if (const char* bad = CheckProxy(*ks.proxyServer)) return bad;
  }
  return CheckServers(ks.kmipServer.servers, ks.proxyServer ? &ks.proxyServer->hostname : nullptr);
}

const char* CheckUpdate(const std::string& provider, const UpdateSpec& spec) {
  if (provider.empty()) return "provider";
  if (spec.masterKeyId && spec.masterKeyId->empty()) return "spec.masterKeyId";
  if (!spec.keyServer) return nullptr;
  const KeyServerUpdateSpec& ks = *spec.keyServer;
  if (ks.type && ks.type->value != KeyServerType::KMIP) return "spec.keyServer.type";
  // An empty proxy hostname removes the proxy.
  if (ks.proxyServer && !ks.proxyServer->hostname.empty()) {
    if (const char* bad = CheckProxy(*ks.proxyServer)) return bad;
  }
  if (ks.kmipServer && ks.kmipServer->servers) {
    return CheckServers(*ks.kmipServer->servers,
                        ks.proxyServer ? &ks.proxyServer->hostname : nullptr);
  }
  return nullptr;
}

// Adds each server, remembering its hostname in `hosts`.
int AddServers(Config::ProviderConfigObjects& objects, const std::vector<Server>& servers,
               std::vector<std::string>& hosts) {
  for (const Server& server : servers) {
    const std::string& host = server.address.hostname;
    int rc = Config::AddServer(objects, server.name, host,
                               server.address.port.value_or(kDefaultKmipPort));
    if (rc != Config::kStoreOk) return rc;
    hosts.push_back(host);
  }
  return Config::kStoreOk;
}

// Sets everything a new provider holds on its objects, in store order,
// stopping at the first failure; the hosts it uses go to `hosts`.
int SetNewProvider(Config::ProviderConfigObjects& objects, const CreateSpec& spec,
                   std::vector<std::string>& hosts) {
  const KeyServerCreateSpec& ks = spec.keyServer;
  int rc = Config::SetMasterKeyId(objects, spec.masterKeyId);
  if (rc == Config::kStoreOk && ks.description)
    rc = Config::SetDescription(objects, *ks.description);
  if (rc == Config::kStoreOk && ks.connectionTimeout) {
    rc = Config::SetConnectionTimeout(objects, *ks.connectionTimeout);
  }
  if (rc == Config::kStoreOk && ks.proxyServer) {
    rc = Config::SetProxy(objects, ks.proxyServer->hostname,
                          ks.proxyServer->port.value_or(kDefaultProxyPort));
    if (rc == Config::kStoreOk) hosts.push_back(ks.proxyServer->hostname);
  }
  if (rc == Config::kStoreOk) rc = Config::SetType(objects, "KMIP");
  if (rc == Config::kStoreOk && ks.kmipServer.username) {
    rc = Config::SetUserName(objects, *ks.kmipServer.username);
  }
  if (rc == Config::kStoreOk) rc = AddServers(objects, ks.kmipServer.servers, hosts);
  return rc;
}

// Sets what an update gives for the key server on the provider's objects,
// stopping at the first failure; the hosts it brings in go to `newHosts`.
// The stored type is never rewritten.
int SetKeyServerChanges(Config::ProviderConfigObjects& objects, const KeyServerUpdateSpec& ks,
                        std::vector<std::string>& newHosts) {
  int rc = Config::kStoreOk;
  if (ks.description) rc = Config::SetDescription(objects, *ks.description);
  if (rc == Config::kStoreOk && ks.connectionTimeout) {
    rc = Config::SetConnectionTimeout(objects, *ks.connectionTimeout);
  }
  if (rc == Config::kStoreOk && ks.proxyServer) {
    const NetworkAddress& proxy = *ks.proxyServer;
    rc = Config::SetProxy(objects, proxy.hostname, proxy.port.value_or(kDefaultProxyPort));
    if (rc == Config::kStoreOk && !proxy.hostname.empty()) newHosts.push_back(proxy.hostname);
  }
  if (!ks.kmipServer) return rc;
  if (rc == Config::kStoreOk && ks.kmipServer->username) {
    rc = Config::SetUserName(objects, *ks.kmipServer->username);
  }
  if (rc == Config::kStoreOk && ks.kmipServer->servers) {
    rc = Config::DeleteAllServers(objects);
    if (rc == Config::kStoreOk) rc = AddServers(objects, *ks.kmipServer->servers, newHosts);
  }
  return rc;
}

}  // namespace

ProvidersImpl::ProvidersImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers,
                             Zyrd::State::Firewall& firewall)
    : providers_(std::move(providers)), firewall_(firewall) {}

void ProvidersImpl::list(::Lumo::AsyncResult<std::vector<Summary>> result) {
  std::vector<std::shared_ptr<Summary>> summaries;
  int rc = Config::ListProviders(summaries);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "List providers failed, %d\n", rc);
    return result.SetError(Zyrd::ZyrApi::MakeConfigStoreError(rc));
  }
  std::vector<Summary> out;
  out.reserve(summaries.size());
  for (const auto& summary : summaries) out.push_back(*summary);
  result.SetResult(out);
}

void ProvidersImpl::get(const std::string& provider, ::Lumo::AsyncResult<Info> result) {
  if (provider.empty()) {
    Log_Level(2, "Get provider called on an empty provider\n");
    return result.SetError(Zyrd::ZyrApi::MakeInvalidParameterError("provider"));
  }
  std::shared_ptr<Info> info;
  int rc = Config::ReadProviderInfo(provider, info);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "Get provider %s failed, %d\n", provider.c_str(), rc);
    return result.SetError(Zyrd::ZyrApi::MakeProviderStoreError(rc, provider));
  }
  result.SetResult(*info);
}

void ProvidersImpl::create(const CreateSpec& spec, ::Lumo::AsyncResult<void> result) {
  const std::string& name = spec.provider;
  if (const char* bad = CheckCreate(spec)) {
    Log_Level(2, "Create provider %s failed, invalid argument %s\n", name.c_str(), bad);
    return result.SetError(Zyrd::ZyrApi::MakeInvalidParameterError(bad));
  }
  UserLock::WriteGuard lock(Config::ConfigLock());
  Config::ProviderConfigObjects objects;
  objects.name = name;
  int rc = Config::CreateProviderObjects(objects);
  std::vector<std::string> hosts;
  if (rc == Config::kStoreOk) rc = SetNewProvider(objects, spec, hosts);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "Create provider %s failed, %d\n", name.c_str(), rc);
    return result.SetError(Zyrd::ZyrApi::MakeProviderStoreError(rc, name));
  }
  if (!firewall_.Update(name, true, hosts, {})) {
    Log_Level(2, "Create provider %s failed to add ips to firewall\n", name.c_str());
    return result.SetError(FirewallError());
  }
  rc = Config::WriteProvider(objects);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "Create provider %s failed, %d\n", name.c_str(), rc);
    // Withdraw only what the update above added: hosts that other providers
    // use were left out of it and stay.
    if (!firewall_.Update(name, true, {}, hosts)) {
      Log_Level(2, "Create provider %s failed to remove ip from firewall\n", name.c_str());
    }
    return result.SetError(Zyrd::ZyrApi::MakeProviderStoreError(rc, name));
  }
  result.SetResult();
}

void ProvidersImpl::update(const std::string& provider, const UpdateSpec& spec,
                           ::Lumo::AsyncResult<void> result) {
  if (const char* bad = CheckUpdate(provider, spec)) {
    Log_Level(2, "Update provider %s failed, invalid argument %s\n", provider.c_str(), bad);
    return result.SetError(Zyrd::ZyrApi::MakeInvalidParameterError(bad));
  }
  UserLock::WriteGuard lock(Config::ConfigLock());
  auto fail = [&](int rc) {
    Log_Level(2, "Update provider %s failed, %d\n", provider.c_str(), rc);
    result.SetError(Zyrd::ZyrApi::MakeProviderStoreError(rc, provider));
  };
  Config::ProviderConfigObjects objects;
  int rc = Config::GetProviderObjects(provider, objects);
  if (rc != Config::kStoreOk) return fail(rc);
  if (spec.masterKeyId) rc = Config::SetMasterKeyId(objects, *spec.masterKeyId);
  if (rc != Config::kStoreOk) return fail(rc);

  std::vector<std::string> oldHosts;
  std::vector<std::string> newHosts;
  if (spec.keyServer) {
    const KeyServerUpdateSpec& ks = *spec.keyServer;
    std::string oldProxy;
    rc = Config::GetProviderHosts(provider, ks.kmipServer && ks.kmipServer->servers,
                                  ks.proxyServer.has_value(), oldHosts, oldProxy);
    if (rc != Config::kStoreOk) {
      Log_Level(2, "Update provider %s failed to get ips to update firewall\n", provider.c_str());
      return result.SetError(Zyrd::ZyrApi::MakeProviderStoreError(rc, provider));
    }
    if (!oldProxy.empty()) oldHosts.push_back(oldProxy);
    rc = SetKeyServerChanges(objects, ks, newHosts);
    if (rc != Config::kStoreOk) return fail(rc);
  }

  const bool firewallChanged = !oldHosts.empty() || !newHosts.empty();
  if (firewallChanged && !firewall_.Update(provider, true, newHosts, oldHosts)) {
    Log_Level(2, "Update provider %s failed to update ips in firewall\n", provider.c_str());
    return result.SetError(FirewallError());
  }
  rc = Config::WriteProvider(objects);
  if (rc != Config::kStoreOk) {
    if (firewallChanged && !firewall_.Update(provider, true, oldHosts, newHosts)) {
      Log_Level(2, "Update provider %s failed to reset ips in firewall\n", provider.c_str());
    }
    return fail(rc);
  }
  providers_->DeleteProviderFromState(provider);
  result.SetResult();
}

void ProvidersImpl::delete_(const std::string& provider, ::Lumo::AsyncResult<void> result) {
  if (provider.empty()) {
    Log_Level(2, "Delete provider called on an empty provider\n");
    return result.SetError(Zyrd::ZyrApi::MakeInvalidParameterError("provider"));
  }
  UserLock::WriteGuard lock(Config::ConfigLock());
  std::vector<std::string> hosts;
  int rc = Config::GetAllProviderHosts(provider, hosts);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "Delete provider %s failed to get ips to update firewall\n", provider.c_str());
    return result.SetError(Zyrd::ZyrApi::MakeProviderStoreError(rc, provider));
  }
  rc = Config::DeleteProvider(provider);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "Delete provider %s failed: %d\n", provider.c_str(), rc);
    return result.SetError(Zyrd::ZyrApi::MakeProviderStoreError(rc, provider));
  }
  providers_->DeleteProviderFromState(provider);
  if (!firewall_.Update(provider, true, {}, hosts)) {
    Log_Level(2, "Delete provider %s failed to remove ips from firewall\n", provider.c_str());
  }
  result.SetResult();
}

}  // namespace Com::Tarsel::Orna::Kms::ProvidersSvc
