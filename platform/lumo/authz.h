// Authorisation: which operations need no authentication, which entitlements
// the others need, and the filter that applies those rules to each call.
#pragma once

#include <functional>
#include <istream>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "platform/lumo/log.h"
#include "platform/lumo/provider.h"

namespace Lumo::Authz {

// The authorisation rules. Built at start-up (the built-in operations that
// need no authentication, then the metadata file's rules) and read-only
// afterwards, when any number of threads may consult it.
class AuthzInfo {
 public:
  static constexpr std::string_view kNoAuthenticationScheme =
      "com.tarsel.lumo.std.security.no_authentication";

  // Starts with the framework's metadata and introspection operations, which
  // need no authentication.
  AuthzInfo();

  // Operations (full method names) listed under `scheme`, sorted.
  std::vector<std::string> OperationsForScheme(std::string_view scheme) const;

  bool NeedsNoAuthentication(const std::string& method) const;
  // The entitlements of which a caller needs at least one; null when the
  // operation has no rule.
  const std::vector<std::string>* RequiredEntitlements(const std::string& method) const;

  // Adds a rule; false when `method` already has one or needs no
  // authentication.
  bool AddRule(const std::string& method, std::vector<std::string> entitlements);

 private:
  std::map<std::string, std::set<std::string>, std::less<>> schemes_;
  std::unordered_set<std::string> noAuthentication_;
  std::unordered_map<std::string, std::vector<std::string>> rules_;
};

// Decides whether an authenticated caller holds one of the entitlements an
// operation needs. Thread-safe.
class EntitlementChecker {
 public:
  virtual ~EntitlementChecker() = default;
  virtual bool HasAnyEntitlement(const Authn::AuthenticationResult& caller,
                                 const std::vector<std::string>& required) const = 0;
};

namespace Metadata {
struct LoadAuthzInfoMetadata {
  // Reads the metadata file from `in` and adds the rules of its
  // "authorization" section to `info`. On failure returns false and appends
  // what went wrong to `messages`; `info` may then hold part of the rules.
  static bool Load(std::istream& in, AuthzInfo& info, Log::Logger* logger,
                   std::vector<std::string>& messages);
};
}  // namespace Metadata

namespace Filter {

// Admits a call when its operation needs no authentication, or when the
// caller is authenticated and holds one of the operation's entitlements.
// Otherwise completes it with "unauthenticated" (no caller) or "unauthorized"
// (a caller without the entitlement). An operation without any rule is
// refused the same way: nothing is callable unless the metadata says so;
// only a method that nothing serves (`isServed` false) is handed on for an
// authenticated caller, so that it learns the operation does not exist.
class AsyncAuthzFilter : public Provider::ApiProvider {
 public:
  using ServedPredicate = std::function<bool(const std::string& method)>;

  // Without `isServed`, every method counts as served.
  AsyncAuthzFilter(Provider::ApiProviderPtr next, std::shared_ptr<const AuthzInfo> info,
                   std::shared_ptr<const EntitlementChecker> checker,
                   std::shared_ptr<Log::Logger> logger, ServedPredicate isServed = nullptr);

  void Invoke(Core::CallPtr call, Core::Completion completion) override;

 private:
  Provider::ApiProviderPtr next_;
  std::shared_ptr<const AuthzInfo> info_;
  std::shared_ptr<const EntitlementChecker> checker_;
  std::shared_ptr<Log::Logger> logger_;
  ServedPredicate isServed_;
};

}  // namespace Filter
}  // namespace Lumo::Authz
