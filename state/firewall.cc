#include "state/firewall.h"

#include <algorithm>

#include "config/provider_config.h"
#include "platform/ssl/firewall_utils.h"
#include "platform/util/log.h"

namespace Zyrd::State {
namespace {

class PlatformHostFirewall final : public HostFirewall {
 public:
  bool AddOrRemoveServer(const std::string& ruleset, bool allow,
                         const std::string& hostname) override {
    return Kestrel::Common::FirewallUtils::AddOrRemoveServer(ruleset, allow, hostname);
  }
};

// Removes every occurrence of `host` from `list`.
void Erase(std::vector<std::string>& list, const std::string& host) {
  list.erase(std::remove(list.begin(), list.end(), host), list.end());
}

bool Contains(const std::vector<std::string>& list, const std::string& host) {
  return std::find(list.begin(), list.end(), host) != list.end();
}

}  // namespace

HostFirewall& PlatformFirewall() {
  static PlatformHostFirewall firewall;
  return firewall;
}

Firewall& GlobalFirewall() {
  static Firewall firewall(PlatformFirewall());
  return firewall;
}

bool Firewall::AddHost(const std::string& host) {
  return host_.AddOrRemoveServer(kFirewallRuleset, true, host);
}

bool Firewall::RemoveHost(const std::string& host) {
  return host_.AddOrRemoveServer(kFirewallRuleset, false, host);
}

bool Firewall::CollectAllHosts(std::vector<std::string>& hosts) {
  std::vector<std::string> ids;
  int rc = Config::ListProviderIds(ids);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "Error %d getting server ips, cannot get provider ids\n", rc);
    return false;
  }
  bool all = true;
  for (const auto& id : ids) {
    std::vector<std::string> providerHosts;
    rc = Config::GetAllProviderHosts(id, providerHosts);
    if (rc != Config::kStoreOk) {
      Log_Level(2, "Error %d getting server ips for provider %s\n", rc, id.c_str());
      all = false;
      continue;
    }
    hosts.insert(hosts.end(), providerHosts.begin(), providerHosts.end());
  }
  return all;
}

void Firewall::OpenAll() {
  std::vector<std::string> hosts;
  if (!CollectAllHosts(hosts)) Log_Level(3, "Error getting server ips for some or all providers\n");
  for (const auto& host : hosts) AddHost(host);
}

void Firewall::CloseAll() {
  std::vector<std::string> hosts;
  if (!CollectAllHosts(hosts)) Log_Level(3, "Error getting server ips for some or all providers\n");
  for (const auto& host : hosts) RemoveHost(host);
}

bool Firewall::DropOtherProvidersHosts(const std::string& provider, std::vector<std::string>& add,
                                       std::vector<std::string>& remove) {
  std::vector<std::string> ids;
  int rc = Config::ListProviderIds(ids);
  if (rc != Config::kStoreOk) {
    Log_Level(2, "Failed to list providers %d\n", rc);
    Log_Level(2, "Update firewall failed to check providers\n");
    return false;
  }
  for (const auto& id : ids) {
    if (add.empty() && remove.empty()) break;
    if (id == provider) continue;
    std::vector<std::string> hosts;
    rc = Config::GetAllProviderHosts(id, hosts);
    if (rc != Config::kStoreOk) {
      Log_Level(2, "Check providers ips failed to get provider %s %d\n", id.c_str(), rc);
      Log_Level(2, "Update firewall failed to check providers\n");
      return false;
    }
    for (const auto& host : hosts) {
      Erase(add, host);
      Erase(remove, host);
    }
  }
  return true;
}

bool Firewall::Update(const std::string& provider, bool checkOthers, std::vector<std::string> add,
                      std::vector<std::string> remove) {
  if (add.empty() && remove.empty()) return true;
  if (checkOthers) {
    // A host both added and removed stays as it is.
    std::vector<std::string> both;
    for (const auto& host : add) {
      if (Contains(remove, host)) both.push_back(host);
    }
    for (const auto& host : both) {
      Erase(add, host);
      Erase(remove, host);
    }
    if (add.empty() && remove.empty()) return true;
    if (!DropOtherProvidersHosts(provider, add, remove)) return false;
  }

  for (size_t i = 0; i < add.size(); ++i) {
    Log_Level(3, "Adding host %s to firewall\n", add[i].c_str());
    if (AddHost(add[i])) continue;
    Log_Level(2, "Failed to add host %s to firewall\n", add[i].c_str());
    for (size_t j = 0; j < i; ++j) {
      if (!RemoveHost(add[j]))
        Log_Level(2, "Failed to remove host %s from firewall\n", add[j].c_str());
    }
    return false;
  }
  for (size_t i = 0; i < remove.size(); ++i) {
    Log_Level(3, "Removing host %s from firewall\n", remove[i].c_str());
    if (RemoveHost(remove[i])) continue;
    Log_Level(2, "Failed to remove host %s from firewall\n", remove[i].c_str());
    for (const auto& host : add) {
      if (!RemoveHost(host)) Log_Level(2, "Failed to remove host %s from firewall\n", host.c_str());
    }
    for (size_t j = 0; j < i; ++j) {
      if (!AddHost(remove[j]))
        Log_Level(2, "Failed to add host %s to firewall\n", remove[j].c_str());
    }
    return false;
  }
  return true;
}

}  // namespace Zyrd::State
