// The provider-chain stages: local dispatch, authentication and
// authorisation filters, and the audit observer.
#include <gtest/gtest.h>

#include <boost/json/serialize.hpp>

#include "platform/lumo/authn.h"
#include "platform/lumo/authz.h"
#include "platform/lumo/call_registrar.h"
#include "platform/lumo/core_messages.h"
#include "platform/lumo/local_provider.h"
#include "platform/token/token_handler.h"

namespace {

using Lumo::Core::MethodResult;
using Lumo::Provider::ApiProvider;

// The end of a chain: counts calls and answers each with the method name.
class Terminal : public ApiProvider {
 public:
  void Invoke(Lumo::Core::CallPtr call, Lumo::Core::Completion completion) override {
    ++calls;
    last = call;
    completion.Complete(MethodResult::Output(boost::json::string(call->method)));
  }
  int calls = 0;
  Lumo::Core::CallPtr last;
};

// A handler that answers every call with a fixed outcome.
class FixedHandler : public Lumo::Authn::AuthnHandler {
 public:
  explicit FixedHandler(Lumo::Authn::AuthnOutcome outcome) : outcome_(std::move(outcome)) {}
  void Authenticate(const Lumo::Core::AsyncActivation&, Lumo::Authn::AuthnCallback done) override {
    ++calls;
    done(outcome_);
  }
  int calls = 0;

 private:
  Lumo::Authn::AuthnOutcome outcome_;
};

Lumo::Authn::AuthenticationResultPtr Caller(std::string user, std::vector<std::string> ents) {
  auto r = std::make_shared<Lumo::Authn::AuthenticationResult>();
  r->username = std::move(user);
  r->entitlements = std::move(ents);
  return r;
}

// Invokes `method` on `provider`; "output:<json>" or the error's name.
std::string Call(ApiProvider& provider, const std::string& method,
                 Lumo::Authn::AuthenticationResultPtr caller = nullptr) {
  auto call = std::make_shared<Lumo::Core::Call>(method, boost::json::object());
  call->activation.authData = std::move(caller);
  std::string out = "(none)";
  provider.Invoke(call, Lumo::Core::Completion(call, [&](MethodResult r) {
                    out = r.IsOutput() ? "output:" + boost::json::serialize(r.output)
                          : r.error    ? r.error->Name()
                                       : "invalid params";
                  }));
  return out;
}

std::shared_ptr<ApiProvider> AuthzFilter(std::shared_ptr<ApiProvider> next,
                                         std::shared_ptr<Lumo::Authz::AuthzInfo> info) {
  return std::make_shared<Lumo::Authz::Filter::AsyncAuthzFilter>(
      std::move(next), std::move(info),
      std::make_shared<OrnaToken::Authz::JwtEntitlementCheckerImpl>(), nullptr);
}

TEST(LocalProviderTest, DispatchesByFullMethodNameThroughTheExecutor) {
  auto iface = std::make_shared<Lumo::Provider::ApiInterface>();
  iface->serviceId = "a.b";
  iface->operations.push_back({"set", [](const Lumo::Core::CallPtr& call, auto c) {
                                 c.Complete(
                                     MethodResult::Output(boost::json::string(call->method)));
                               }});
  int tasks = 0;
  Lumo::Provider::AsyncLocalProvider provider(
      [&](std::function<void()> task) {
        ++tasks;
        task();
      },
      {iface}, nullptr);
  EXPECT_EQ(Call(provider, "a.b.set"), R"(output:"a.b.set")");
  EXPECT_EQ(tasks, 1);
  EXPECT_EQ(Call(provider, "a.b.list"), "com.tarsel.lumo.std.errors.operation_not_found");
  EXPECT_EQ(Call(provider, "nodots"), "com.tarsel.lumo.std.errors.operation_not_found");
  EXPECT_EQ(tasks, 1);
  EXPECT_EQ(
      Call(provider, "com.tarsel.lumo.std.introspection.service.list").find(R"(output:["a.b")"),
      0u);
}

// A served operation without a rule is refused; one that nothing serves is
// handed on (the local provider answers that it does not exist). Which
// calls the filter admits under the daemon's metadata is shown by the API
// provider's tests.
TEST(AuthzFilterTest, OnlyUnservedOperationsWithoutRulePassToTheProvider) {
  auto terminal = std::make_shared<Terminal>();
  Lumo::Authz::Filter::AsyncAuthzFilter filter(
      terminal, std::make_shared<Lumo::Authz::AuthzInfo>(),
      std::make_shared<OrnaToken::Authz::JwtEntitlementCheckerImpl>(), nullptr,
      [](const std::string& method) { return method == "a.b.served"; });
  auto caller = Caller("root", {"@ORNA+KMS_ADMIN"});
  EXPECT_EQ(Call(filter, "a.b.served", caller), "com.tarsel.lumo.std.errors.unauthorized");
  EXPECT_EQ(Call(filter, "a.b.gone", caller), R"(output:"a.b.gone")");
  EXPECT_EQ(Call(filter, "a.b.gone"), "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(terminal->calls, 1);
}

TEST(AuthzInfoTest, StartsWithExactlyTheThirtySixBuiltInOperations) {
  Lumo::Authz::AuthzInfo info;
  EXPECT_EQ(info.OperationsForScheme(Lumo::Authz::AuthzInfo::kNoAuthenticationScheme).size(), 36u);
  EXPECT_TRUE(info.NeedsNoAuthentication("com.tarsel.lumo.metadata.cli.command.fingerprint"));
  EXPECT_FALSE(info.NeedsNoAuthentication("com.tarsel.orna.kms.status.get"));
  // A rule cannot make a built-in operation need authentication.
  EXPECT_FALSE(info.AddRule("com.tarsel.lumo.std.introspection.provider.get", {"@X"}));
}

TEST(AuthnFilterTest, NoResultPassesOnResultAttachesErrorStops) {
  auto terminal = std::make_shared<Terminal>();
  auto filter = [&](Lumo::Authn::AuthnOutcome outcome) {
    auto handler = std::make_shared<FixedHandler>(std::move(outcome));
    return std::make_pair(
        std::make_shared<Lumo::Authn::Filter::AsyncAuthnFilter>(terminal, handler), handler);
  };
  EXPECT_EQ(Call(*filter({}).first, "svc.op"), R"(output:"svc.op")");
  EXPECT_EQ(terminal->last->activation.authData, nullptr);

  Call(*filter({Caller("u", {}), nullptr}).first, "svc.op");
  ASSERT_NE(terminal->last->activation.authData, nullptr);
  EXPECT_EQ(terminal->last->activation.authData->username, "u");

  auto [refusing, handler] = filter({nullptr, Lumo::Core::UnauthenticatedError()});
  EXPECT_EQ(Call(*refusing, "svc.op"), "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(terminal->calls, 2);
  // A call an outer filter authenticated does not reach this handler.
  EXPECT_EQ(Call(*refusing, "svc.op", Caller("root", {})), R"(output:"svc.op")");
  EXPECT_EQ(handler->calls, 1);
}

// Every record has all four attributes, even for a call that names no service.
TEST(CallRegistrarTest, RecordsTheFourAttributesWithTheOutcome) {
  std::vector<std::string> records;
  auto record = [&](const Lumo::Observer::AuditAttributes& a) {
    EXPECT_EQ(a.size(), 4u);
    records.push_back(a.at("eventID") + " " + a.at("subject") + " " + a.at("object") + " " +
                      a.at("result"));
  };
  auto terminal = std::make_shared<Terminal>();
  Lumo::Observer::CallRegistrar ok(terminal, record);
  Call(ok, "com.tarsel.orna.kms.status.get", Caller("root", {}));
  Call(ok, "nodots");
  Lumo::Observer::CallRegistrar failing(
      AuthzFilter(terminal, std::make_shared<Lumo::Authz::AuthzInfo>()), record);
  Call(failing, "svc.op");
  EXPECT_EQ(records, (std::vector<std::string>{"api.call root com.tarsel.orna.kms.status:get true",
                                               "api.call   true", "api.call  svc:op false"}));
}

}  // namespace
