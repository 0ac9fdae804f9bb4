// Assembly of the API provider: the daemon's bound services, the framework's
// metadata and introspection services, and the stages every call passes, from
// the outside in:
//   audit observer -> operation-id stage -> attestation token filter ->
//   admin token filter -> authorisation filter -> local provider.
// Built once at start-up on the main thread; the result is immutable and
// serves calls from any number of threads.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>

#include "daemon/logger.h"
#include "daemon/stats.h"
#include "platform/lumo/provider.h"
#include "platform/util/hostinfo.h"
#include "state/firewall.h"
#include "state/provider_lookup.h"

namespace Zyrd::ZyrApi {

inline constexpr const char* kMetadataPath = "/usr/lib/tarsel/lumo/zyr_lumo_metadata.json";

// What the assembled provider reaches outside itself.
struct ProviderDependencies {
  // Each provider's key server client.
  std::shared_ptr<State::ProviderLookup> providers;
  // The firewall ruleset kept in step with the providers; must outlive the
  // provider.
  State::Firewall* firewall = &State::GlobalFirewall();
  // vouchd's public key (PEM) for attestation tokens; false when unavailable.
  std::function<bool(std::string& key)> readVouchdPublicKey;
  // Full paths; the daemon's are under the root (Groundwork::RootPath).
  std::string metadataPath;
  std::string adminTokenPath;
  // Time for token expiry checks; must outlive the provider.
  const Groundwork::Clock* clock = &Groundwork::SystemClock();
  // Counts key operations; must outlive the provider.
  Stats::KeyStats* stats = &Stats::Global();
};

// The daemon's dependencies: paths under the root, the host clock, the
// process-wide statistics. `providers` and `readVouchdPublicKey` are the
// caller's to supply.
ProviderDependencies DefaultDependencies();

// Builds the chain. A metadata section that does not load logs
// "Error loading file: %s" (or "Error loading authz metadata file: %s") and
// stops the process: the daemon does not run without its metadata.
Lumo::Provider::ApiProviderPtr CreateLocalProvider(Lumo::Executor executor,
                                                   std::shared_ptr<LumoLoggerWrapper> logger,
                                                   const ProviderDependencies& deps);

// Writes the "api.call" host audit record of one call from its attributes.
// A record without all four of eventID, subject, object and result is a
// programming error that stops the process.
void WriteAuditRecord(const std::map<std::string, std::string>& attributes);

}  // namespace Zyrd::ZyrApi
