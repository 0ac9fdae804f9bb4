#include "platform/lumo/authz.h"

#include <boost/json/parse.hpp>
#include <iterator>

#include "platform/lumo/core_messages.h"

namespace Lumo::Authz {
namespace {

// Operations of the framework's own services, which anyone may call.
constexpr const char* kBuiltInNoAuthentication[] = {
    // command-line metadata
    "com.tarsel.lumo.metadata.cli.command.list",
    "com.tarsel.lumo.metadata.cli.command.get",
    "com.tarsel.lumo.metadata.cli.command.fingerprint",
    "com.tarsel.lumo.metadata.cli.namespace.list",
    "com.tarsel.lumo.metadata.cli.namespace.get",
    "com.tarsel.lumo.metadata.cli.namespace.fingerprint",
    // authentication metadata
    "com.tarsel.lumo.metadata.authentication.component.list",
    "com.tarsel.lumo.metadata.authentication.component.get",
    "com.tarsel.lumo.metadata.authentication.component.fingerprint",
    "com.tarsel.lumo.metadata.authentication.service.operation.list",
    "com.tarsel.lumo.metadata.authentication.service.operation.get",
    "com.tarsel.lumo.metadata.authentication.package.list",
    "com.tarsel.lumo.metadata.authentication.package.get",
    "com.tarsel.lumo.metadata.authentication.service.list",
    "com.tarsel.lumo.metadata.authentication.service.get",
    // metamodel
    "com.tarsel.lumo.metadata.metamodel.component.list",
    "com.tarsel.lumo.metadata.metamodel.component.get",
    "com.tarsel.lumo.metadata.metamodel.component.fingerprint",
    "com.tarsel.lumo.metadata.metamodel.enumeration.list",
    "com.tarsel.lumo.metadata.metamodel.enumeration.get",
    "com.tarsel.lumo.metadata.metamodel.resource.model.list",
    "com.tarsel.lumo.metadata.metamodel.service.operation.list",
    "com.tarsel.lumo.metadata.metamodel.service.operation.get",
    "com.tarsel.lumo.metadata.metamodel.service.hidden.list",
    "com.tarsel.lumo.metadata.metamodel.package.list",
    "com.tarsel.lumo.metadata.metamodel.package.get",
    "com.tarsel.lumo.metadata.metamodel.resource.list",
    "com.tarsel.lumo.metadata.metamodel.service.list",
    "com.tarsel.lumo.metadata.metamodel.service.get",
    "com.tarsel.lumo.metadata.metamodel.structure.list",
    "com.tarsel.lumo.metadata.metamodel.structure.get",
    // introspection
    "com.tarsel.lumo.std.introspection.operation.list",
    "com.tarsel.lumo.std.introspection.operation.get",
    "com.tarsel.lumo.std.introspection.provider.get",
    "com.tarsel.lumo.std.introspection.service.list",
    "com.tarsel.lumo.std.introspection.service.get",
};
static_assert(std::size(kBuiltInNoAuthentication) == 36);

}  // namespace

AuthzInfo::AuthzInfo() {
  auto& ops = schemes_[std::string(kNoAuthenticationScheme)];
  for (const char* op : kBuiltInNoAuthentication) {
    ops.insert(op);
    noAuthentication_.insert(op);
  }
}

std::vector<std::string> AuthzInfo::OperationsForScheme(std::string_view scheme) const {
  auto it = schemes_.find(scheme);
  if (it == schemes_.end()) return {};
  return {it->second.begin(), it->second.end()};
}

bool AuthzInfo::NeedsNoAuthentication(const std::string& method) const {
  return noAuthentication_.count(method) != 0;
}

const std::vector<std::string>* AuthzInfo::RequiredEntitlements(const std::string& method) const {
  auto it = rules_.find(method);
  return it == rules_.end() ? nullptr : &it->second;
}

bool AuthzInfo::AddRule(const std::string& method, std::vector<std::string> entitlements) {
  if (NeedsNoAuthentication(method)) return false;
  return rules_.emplace(method, std::move(entitlements)).second;
}

namespace Metadata {

bool LoadAuthzInfoMetadata::Load(std::istream& in, AuthzInfo& info, Log::Logger* logger,
                                 std::vector<std::string>& messages) {
  auto fail = [&](std::string text) {
    LUMO_LOG(logger, Log::kError) << "Authorization metadata: " << text << "\n";
    messages.push_back(std::move(text));
    return false;
  };
  std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  if (in.bad()) return fail("the file cannot be read");
  boost::system::error_code ec;
  boost::json::value root = boost::json::parse(text, ec);
  if (ec) return fail("not valid JSON (" + ec.message() + ")");
  const boost::json::value* section =
      root.is_object() ? root.get_object().if_contains("authorization") : nullptr;
  const boost::json::value* rules = section != nullptr && section->is_object()
                                        ? section->get_object().if_contains("rules")
                                        : nullptr;
  if (rules == nullptr || !rules->is_array()) return fail("no \"authorization\".\"rules\" list");

  for (const auto& rule : rules->get_array()) {
    const boost::json::value* ents =
        rule.is_object() ? rule.get_object().if_contains("entitlements") : nullptr;
    const boost::json::value* ops =
        rule.is_object() ? rule.get_object().if_contains("operations") : nullptr;
    if (ents == nullptr || !ents->is_array() || ents->get_array().empty() || ops == nullptr ||
        !ops->is_array()) {
      return fail("each rule needs a non-empty \"entitlements\" list and an \"operations\" list");
    }
    std::vector<std::string> entitlements;
    for (const auto& e : ents->get_array()) {
      if (!e.is_string() || e.get_string().empty())
        return fail("entitlements must be non-empty strings");
      entitlements.emplace_back(e.get_string());
    }
    for (const auto& op : ops->get_array()) {
      if (!op.is_string() || op.get_string().find('.') == boost::json::string::npos) {
        return fail("operations must be full method names");
      }
      std::string method(op.get_string());
      if (!info.AddRule(method, entitlements)) return fail("a second rule for " + method);
    }
  }
  return true;
}

}  // namespace Metadata

namespace Filter {

AsyncAuthzFilter::AsyncAuthzFilter(Provider::ApiProviderPtr next,
                                   std::shared_ptr<const AuthzInfo> info,
                                   std::shared_ptr<const EntitlementChecker> checker,
                                   std::shared_ptr<Log::Logger> logger, ServedPredicate isServed)
    : next_(std::move(next)),
      info_(std::move(info)),
      checker_(std::move(checker)),
      logger_(std::move(logger)),
      isServed_(std::move(isServed)) {}

void AsyncAuthzFilter::Invoke(Core::CallPtr call, Core::Completion completion) {
  if (info_->NeedsNoAuthentication(call->method)) {
    next_->Invoke(std::move(call), std::move(completion));
    return;
  }
  const Authn::AuthenticationResultPtr& caller = call->activation.authData;
  if (caller == nullptr) {
    LUMO_LOG(logger_, Log::kDebug) << "Unauthenticated call to " << call->method << "\n";
    completion.Complete(Core::MethodResult::Error(Core::UnauthenticatedError()));
    return;
  }
  const std::vector<std::string>* required = info_->RequiredEntitlements(call->method);
  if (required == nullptr && isServed_ && !isServed_(call->method)) {
    next_->Invoke(std::move(call), std::move(completion));  // answers operation_not_found
    return;
  }
  if (required == nullptr || !checker_->HasAnyEntitlement(*caller, *required)) {
    LUMO_LOG(logger_, Log::kDebug)
        << "Call to " << call->method << " by " << caller->username << " is not authorized\n";
    completion.Complete(Core::MethodResult::Error(Core::UnauthorizedError(call->method)));
    return;
  }
  next_->Invoke(std::move(call), std::move(completion));
}

}  // namespace Filter
}  // namespace Lumo::Authz
