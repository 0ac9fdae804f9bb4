// Firewall synchronisation: the daemon's host firewall ruleset
// "ironvale-zyrd" allows exactly the host names that configured providers
// use (each KMIP server's and each proxy's). Start-up opens all of them,
// the exit routine withdraws all of them, and every provider create, update
// and delete applies its difference through Update, with rollback.
//
// The host lists are read from the configuration store. Update runs inside
// the providers service's write hold of "configLock"; OpenAll and CloseAll
// run at start-up and exit without it. Not synchronised itself: the
// HostFirewall serialises the changes.
#pragma once

#include <string>
#include <vector>

namespace Zyrd::State {

inline constexpr const char* kFirewallRuleset = "ironvale-zyrd";

// One change to a host firewall ruleset; true on success. The daemon's is
// the platform call; tests make chosen calls fail.
class HostFirewall {
 public:
  virtual ~HostFirewall() = default;
  virtual bool AddOrRemoveServer(const std::string& ruleset, bool allow,
                                 const std::string& hostname) = 0;
};

// Kestrel::Common::FirewallUtils::AddOrRemoveServer.
HostFirewall& PlatformFirewall();

class Firewall {
 public:
  // `host` must outlive this object.
  explicit Firewall(HostFirewall& host) : host_(host) {}
  Firewall(const Firewall&) = delete;
  Firewall& operator=(const Firewall&) = delete;

  // Appends every provider's server host names, then its proxy's. False
  // when the providers could not be listed or some provider could not be
  // read (the others are still collected); each failure is logged.
  bool CollectAllHosts(std::vector<std::string>& hosts);
  // Allows every collected host; individual failures are ignored.
  void OpenAll();
  // Withdraws every collected host; individual failures are ignored.
  void CloseAll();

  // Allows `add`, then withdraws `remove`, in order. With `checkOthers`, a
  // host named in both lists, and a host that a provider other than
  // `provider` uses, is neither allowed nor withdrawn. On a failure the
  // changes made so far are undone (best effort; failures of the undo are
  // logged) and the result is false.
  bool Update(const std::string& provider, bool checkOthers, std::vector<std::string> add,
              std::vector<std::string> remove);

 private:
  bool AddHost(const std::string& host);
  bool RemoveHost(const std::string& host);
  bool DropOtherProvidersHosts(const std::string& provider, std::vector<std::string>& add,
                               std::vector<std::string>& remove);

  HostFirewall& host_;
};

// The daemon's firewall synchronisation over the platform call.
Firewall& GlobalFirewall();

}  // namespace Zyrd::State
