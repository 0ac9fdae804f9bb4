// The host firewall rulesets that the daemon owns.
//
// A ruleset is a named set of host names that the host firewall lets the
// daemon reach. Each ruleset is kept as a text file under the root,
// "/var/lib/zyrd/firewall/<ruleset>": one host per line, sorted, without
// duplicates, mode 0644, replaced atomically on every change (temporary
// file, flush, rename, flush of the directory), so the host's firewall
// integration always reads a complete set. Calls are serialised within the
// process; the functions are thread-safe.
#pragma once

#include <string>
#include <string_view>

namespace Kestrel::Common::FirewallUtils {

inline constexpr std::string_view kRulesetDirectory = "/var/lib/zyrd/firewall";

// Allows (`allow` true) or withdraws (false) `hostname` in `ruleset`.
// Allowing a host already allowed and withdrawing one that is not both
// succeed and leave the file untouched. Fails (logging why at level 2) when
// the file cannot be read or replaced, for a ruleset name that is not a
// plain file name, and for a host name that is empty or holds a byte outside
// printable ASCII or a blank: such a name could not be one line of the file.
bool AddOrRemoveServer(const std::string& ruleset, bool allow, const std::string& hostname);

// Whether `hostname` can be kept in a ruleset.
bool IsValidHostname(std::string_view hostname);

}  // namespace Kestrel::Common::FirewallUtils
