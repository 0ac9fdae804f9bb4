// The provider-chain stages: local dispatch, authentication and
// authorisation filters, and the audit observer.
#include <gtest/gtest.h>

#include <boost/json/serialize.hpp>
#include <optional>

#include "platform/lumo/authn.h"
#include "platform/lumo/authz.h"
#include "platform/lumo/call_registrar.h"
#include "platform/lumo/core_messages.h"
#include "platform/lumo/local_provider.h"

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

class AnyOf : public Lumo::Authz::EntitlementChecker {
 public:
  bool HasAnyEntitlement(const Lumo::Authn::AuthenticationResult& caller,
                         const std::vector<std::string>& required) const override {
    for (const auto& e : caller.entitlements) {
      if (std::find(required.begin(), required.end(), e) != required.end()) return true;
    }
    return false;
  }
};

Lumo::Authn::AuthenticationResultPtr Caller(std::string user, std::vector<std::string> ents) {
  auto r = std::make_shared<Lumo::Authn::AuthenticationResult>();
  r->username = std::move(user);
  r->entitlements = std::move(ents);
  return r;
}

// Invokes `method` on `provider`; "output:<text>" or the error's name.
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

Lumo::Provider::ApiInterfacePtr EchoService(std::string id, std::vector<std::string> ops) {
  auto iface = std::make_shared<Lumo::Provider::ApiInterface>();
  iface->serviceId = std::move(id);
  for (auto& op : ops) {
    iface->operations.push_back(
        {op, [](const Lumo::Core::CallPtr& call, Lumo::Core::Completion c) {
           c.Complete(MethodResult::Output(boost::json::string("ran " + call->method)));
         }});
  }
  return iface;
}

TEST(LocalProviderTest, DispatchesByFullMethodNameThroughTheExecutor) {
  int tasks = 0;
  Lumo::Provider::AsyncLocalProvider provider(
      [&](std::function<void()> task) {
        ++tasks;
        task();
      },
      {EchoService("a.b", {"get", "set"})}, nullptr);
  EXPECT_EQ(Call(provider, "a.b.set"), R"(output:"ran a.b.set")");
  EXPECT_EQ(tasks, 1);
  EXPECT_EQ(Call(provider, "a.b.list"), "com.tarsel.lumo.std.errors.operation_not_found");
  EXPECT_EQ(Call(provider, "nodots"), "com.tarsel.lumo.std.errors.operation_not_found");
  EXPECT_EQ(tasks, 1);
}

TEST(LocalProviderTest, IntrospectionDescribesWhatIsBound) {
  Lumo::Provider::AsyncLocalProvider provider([](std::function<void()> t) { t(); },
                                              {EchoService("a.b", {"get"})}, nullptr);
  std::string got = Call(provider, "com.tarsel.lumo.std.introspection.provider.get");
  EXPECT_NE(got.find(R"("id":"AsyncLocalProvider")"), std::string::npos) << got;
  got = Call(provider, "com.tarsel.lumo.std.introspection.service.list");
  EXPECT_EQ(got.find(R"(output:["a.b","com.tarsel.lumo.std.introspection.)"), 0u) << got;

  auto call = std::make_shared<Lumo::Core::Call>("com.tarsel.lumo.std.introspection.operation.list",
                                                 boost::json::object{{"serviceId", "a.b"}});
  MethodResult r;
  provider.Invoke(call, Lumo::Core::Completion(call, [&](MethodResult m) { r = std::move(m); }));
  EXPECT_EQ(boost::json::serialize(r.output), R"(["get"])");
}

TEST(AuthzInfoTest, StartsWithExactlyTheThirtySixBuiltInOperations) {
  Lumo::Authz::AuthzInfo info;
  auto ops = info.OperationsForScheme(Lumo::Authz::AuthzInfo::kNoAuthenticationScheme);
  EXPECT_EQ(ops.size(), 36u);
  EXPECT_TRUE(info.NeedsNoAuthentication("com.tarsel.lumo.metadata.cli.command.fingerprint"));
  EXPECT_TRUE(info.NeedsNoAuthentication("com.tarsel.lumo.std.introspection.provider.get"));
  EXPECT_FALSE(info.NeedsNoAuthentication("com.tarsel.orna.kms.status.get"));
  // A rule cannot make a built-in operation need authentication.
  EXPECT_FALSE(info.AddRule("com.tarsel.lumo.std.introspection.provider.get", {"@X"}));
}

class AuthzFilterTest : public ::testing::Test {
 protected:
  void SetUp() override {
    auto info = std::make_shared<Lumo::Authz::AuthzInfo>();
    info->AddRule("svc.keys", {"@ATTEST+KEY_OPERATIONS", "@ORNA+KMS_ADMIN"});
    info->AddRule("svc.admin", {"@ORNA+KMS_ADMIN"});
    filter_ = std::make_shared<Lumo::Authz::Filter::AsyncAuthzFilter>(
        terminal_, info, std::make_shared<AnyOf>(), nullptr);
  }
  std::shared_ptr<Terminal> terminal_ = std::make_shared<Terminal>();
  std::shared_ptr<ApiProvider> filter_;
};

TEST_F(AuthzFilterTest, AdmitsByEntitlementAndTellsUnauthenticatedFromUnauthorized) {
  auto attest = Caller("<ATTEST>", {"@ATTEST+KEY_OPERATIONS"});
  auto admin = Caller("root", {"@ORNA+KMS_ADMIN"});
  EXPECT_EQ(Call(*filter_, "svc.keys", attest), R"(output:"svc.keys")");
  EXPECT_EQ(Call(*filter_, "svc.keys", admin), R"(output:"svc.keys")");
  EXPECT_EQ(Call(*filter_, "svc.admin", admin), R"(output:"svc.admin")");
  EXPECT_EQ(Call(*filter_, "svc.admin", attest), "com.tarsel.lumo.std.errors.unauthorized");
  EXPECT_EQ(Call(*filter_, "svc.keys"), "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(Call(*filter_, "svc.admin"), "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(terminal_->calls, 3);
}

TEST_F(AuthzFilterTest, BuiltInsNeedNoCallerAndUnlistedOperationsAreRefused) {
  EXPECT_EQ(Call(*filter_, "com.tarsel.lumo.metadata.metamodel.service.list"),
            R"(output:"com.tarsel.lumo.metadata.metamodel.service.list")");
  EXPECT_EQ(Call(*filter_, "svc.unlisted"), "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(Call(*filter_, "svc.unlisted", Caller("root", {"@ORNA+KMS_ADMIN"})),
            "com.tarsel.lumo.std.errors.unauthorized");
  EXPECT_EQ(terminal_->calls, 1);
}

TEST(AuthnFilterTest, NoResultPassesOnResultAttachesErrorStops) {
  auto terminal = std::make_shared<Terminal>();
  auto none = std::make_shared<FixedHandler>(Lumo::Authn::AuthnOutcome{});
  Lumo::Authn::Filter::AsyncAuthnFilter passOn(terminal, none);
  EXPECT_EQ(Call(passOn, "svc.op"), R"(output:"svc.op")");
  EXPECT_EQ(terminal->last->activation.authData, nullptr);

  auto accept = std::make_shared<FixedHandler>(Lumo::Authn::AuthnOutcome{Caller("u", {}), nullptr});
  Lumo::Authn::Filter::AsyncAuthnFilter accepting(terminal, accept);
  Call(accepting, "svc.op");
  ASSERT_NE(terminal->last->activation.authData, nullptr);
  EXPECT_EQ(terminal->last->activation.authData->username, "u");

  auto refuse = std::make_shared<FixedHandler>(
      Lumo::Authn::AuthnOutcome{nullptr, Lumo::Core::UnauthenticatedError()});
  Lumo::Authn::Filter::AsyncAuthnFilter refusing(terminal, refuse);
  EXPECT_EQ(Call(refusing, "svc.op"), "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(terminal->calls, 2);

  // A call an outer filter authenticated does not reach this handler.
  EXPECT_EQ(Call(refusing, "svc.op", Caller("root", {})), R"(output:"svc.op")");
  EXPECT_EQ(refuse->calls, 1);
}

TEST(CallRegistrarTest, RecordsTheFourAttributesWithTheOutcome) {
  std::vector<Lumo::Observer::AuditAttributes> records;
  auto terminal = std::make_shared<Terminal>();
  Lumo::Observer::CallRegistrar ok(terminal, [&](const auto& a) { records.push_back(a); });
  Call(ok, "com.tarsel.orna.kms.status.get", Caller("root", {}));
  Call(ok, "nodots");

  Lumo::Authz::Filter::AsyncAuthzFilter refusing(
      terminal, std::make_shared<Lumo::Authz::AuthzInfo>(), std::make_shared<AnyOf>(), nullptr);
  Lumo::Observer::CallRegistrar failing(std::shared_ptr<ApiProvider>(&refusing, [](auto*) {}),
                                        [&](const auto& a) { records.push_back(a); });
  Call(failing, "svc.op");

  using A = Lumo::Observer::AuditAttributes;
  ASSERT_EQ(records.size(), 3u);
  EXPECT_EQ(records[0], (A{{"eventID", "api.call"},
                           {"subject", "root"},
                           {"object", "com.tarsel.orna.kms.status:get"},
                           {"result", "true"}}));
  EXPECT_EQ(records[1],
            (A{{"eventID", "api.call"}, {"subject", ""}, {"object", ""}, {"result", "true"}}));
  EXPECT_EQ(
      records[2],
      (A{{"eventID", "api.call"}, {"subject", ""}, {"object", "svc:op"}, {"result", "false"}}));
}

}  // namespace
