// The providers configuration as one text: export with a digest, import,
// and the boot-time restore.
//
// The exported scope is every "providers" instance (group "kms", component
// "orna") with everything below it, and nothing else. The text is the
// store's export text, so equal configurations give equal texts and equal
// digests. Results are store status codes (0 or 2); failures are logged at
// level 2. Import runs under "configLock" held for write by its caller;
// export and restore take no lock.
#pragma once

#include <functional>
#include <string>
#include <string_view>

namespace Zyrd::Config {

// Computes the hexadecimal digest of a text; false on failure.
using DigestFunction = std::function<bool(std::string_view text, std::string& hex)>;

// The providers configuration and its SHA-256 digest (lower-case hex).
// Both outputs are set only on success.
int ExportConfig(std::string& config, std::string& digest);
// The same with another digest computation (tests use it to fail one).
int ExportConfig(std::string& config, std::string& digest, const DigestFunction& computeDigest);

// Replaces the stored providers with those of `config`, in one transaction.
// A text the store refuses changes nothing and gives 2.
int ImportConfig(const std::string& config);

// Whether `config` may replace the providers configuration: false, with the
// reason, for an export text that covers or holds anything but the providers
// (another record such as the attestation certificate or "zyrd_config"), or
// that gives a provider value another type than its record's. A text that
// is no export at all passes here; ImportConfig refuses it.
bool CheckImportScope(const std::string& config, std::string& reason);

// Marks every stored provider, and "zyrd_config", as restored for this
// boot. Called once at start-up, before the endpoint serves; failures are
// logged and never stop start-up.
void RestoreConfig();

}  // namespace Zyrd::Config
