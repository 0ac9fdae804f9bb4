// The assembled API provider driven through the JSON-RPC handler with JSON
// bodies, as the HTTP transport drives it.
#include "api/provider.h"

#include <gtest/gtest.h>

#include <boost/json.hpp>
#include <fstream>
#include <set>

#include "errors/error_builders.h"
#include "platform/audit/audit.h"
#include "platform/lumo/authz.h"
#include "platform/lumo/jsonrpc.h"
#include "platform/lumo/metadata.h"
#include "tests/api/token_signer.h"
#include "tests/support/api_chain.h"
#include "tests/support/fake_kms.h"
#include "tests/support/fakes.h"
#include "tests/support/log_capture.h"

namespace {

namespace M = Lumo::Provider::Metadata;
using boost::json::value;

const std::string& kMetadata = ZyrdTest::kMetadataFile;
constexpr long kNow = 1'700'000'000;

class AuditLines : public Tsl::Audit::AuditSink {
 public:
  bool Write(std::string_view line) override {
    std::lock_guard<std::mutex> lock(mutex);
    lines.push_back(boost::json::parse(line));
    return true;
  }
  std::mutex mutex;
  std::vector<value> lines;
};

class ApiProviderTest : public ::testing::Test {
 protected:
  void SetUp() override {
    Tsl::Audit::SetAuditSink(&audit_);
    clock_.SetRealtimeUs(kNow * 1'000'000);
    providers_->Add("p1",
                    std::make_shared<ZyrdTest::FakeKms>(std::vector<ZyrdTest::FakeKms::Server>{
                        {"s1", Zyrd::Kms::KeyServerTimeout}, {"s2"}}));
    Zyrd::ZyrApi::ProviderDependencies deps;
    deps.providers = providers_;
    deps.readVouchdPublicKey = [](std::string& key) {
      key = ZyrdTest::VouchdKey().publicPem;
      return true;
    };
    deps.clock = &clock_;
    deps.stats = &stats_;
    chain_ = std::make_unique<ZyrdTest::ApiChain>(deps);
  }
  void TearDown() override { Tsl::Audit::SetAuditSink(nullptr); }

  ZyrdTest::LogCapture log_{5};
  ZyrdTest::FakeClock clock_;
  Zyrd::Stats::KeyStats stats_{clock_};
  AuditLines audit_;
  std::shared_ptr<ZyrdTest::FakeProviders> providers_ = std::make_shared<ZyrdTest::FakeProviders>();
  std::unique_ptr<ZyrdTest::ApiChain> chain_;
};

// Each call's outcome (what the output holds, the error name in the body and
// the header, or the JSON-RPC error) and its audit record.
TEST_F(ApiProviderTest, CallsAndTheirOutcomesThroughTheWholeChain) {
  const std::string attest = ZyrdTest::TokenBuilder::Valid(kNow).Sign();
  const std::string expired = ZyrdTest::TokenBuilder::Valid(kNow).Exp(kNow - 1).Sign();
  const std::string& admin = chain_->AdminToken();
  const std::string ops = "com.tarsel.orna.kms.key_operation.", e = "com.tarsel.lumo.std.errors.";
  const std::string p1 = R"({"provider":"p1","keySize":32})";
  const struct {
    std::string method, params, token, outcome;
  } cases[] = {
      {ops + "generate_key", p1, attest,
       R"({"output":{"wrappedKey":"wrapped-by-s2","key":"a2V5LWZyb20ts2"}})"},
      {ops + "decrypt", R"({"provider":"p1","wrappedKey":"w"})", attest,
       R"({"output":{"key":"plain-of-w"}})"},
      {ops + "generate_key", p1, admin,
       R"({"output":{"wrappedKey":"wrapped-by-s2","key":"a2V5LWZyb20ts2"}})"},
      {ops + "generate_key", R"({"provider":"","keySize":32})", attest, e + "invalid_argument"},
      {ops + "generate_key", R"({"provider":"p9","keySize":32})", admin, e + "not_found"},
      {ops + "encrypt", R"({"plaintext":"x"})", attest, e + "error"},
      {ops + "generate_key", p1, "", e + "unauthenticated"},
      {ops + "generate_key", p1, "not-a-token", e + "unauthenticated"},
      {ops + "generate_key", p1, expired, e + "unauthenticated"},
      {"com.tarsel.orna.kms.status.get", "{}", attest,
       R"({"output":{"health":"HEALTHY","details":"","messages":[]}})"},
      {"com.tarsel.orna.kms.providers.list", "{}", attest, e + "unauthorized"},
      {"com.tarsel.orna.kms.nothing.here", "{}", admin, e + "operation_not_found"},
      {"com.tarsel.orna.kms.nothing.here", "{}", attest, e + "operation_not_found"},
      {"com.tarsel.orna.kms.nothing.here", "{}", "", e + "unauthenticated"},
      {ops + "generate_key", R"({"provider":"p1","keysize":32})", attest,
       "Invalid params: field 'keySize': missing"},
      // Metadata and introspection need no token.
      {"com.tarsel.lumo.std.introspection.provider.get", "{}", "", R"("id":"AsyncLocalProvider")"},
      {"com.tarsel.lumo.std.introspection.operation.get",
       R"({"serviceId":"com.tarsel.orna.kms.key_operation","operationId":"decrypt"})", "",
       R"({"name":"wrappedKey")"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.method + " " + c.params);
    audit_.lines.clear();
    auto result = chain_->Send(
        R"({"jsonrpc":"2.0","id":1,"method":")" + c.method + R"(","params":)" + c.params + "}",
        c.token);
    const value parsed = boost::json::parse(result.body);
    const auto& body = parsed.as_object();
    std::string outcome = body.contains("error")
                              ? std::string(body.at("error").at("message").as_string())
                          : body.at("result").as_object().contains("error")
                              ? std::string(body.at("result").at("error").at("name").as_string())
                              : boost::json::serialize(body.at("result"));
    EXPECT_NE(outcome.find(c.outcome), std::string::npos) << outcome;
    EXPECT_EQ(result.errorName, outcome.rfind(e, 0) == 0 ? outcome : "");
    ASSERT_EQ(audit_.lines.size(), 1u);
    EXPECT_EQ(audit_.lines[0].at("success").as_bool(), outcome[0] == '{');
    EXPECT_EQ(
        audit_.lines[0].at("object").as_string(),
        c.method.substr(0, c.method.rfind('.')) + ":" + c.method.substr(c.method.rfind('.') + 1));
  }
  EXPECT_EQ(log_.Count("GenerateKey failed on provider p1 server s1"), 2u);
}

// The metadata file names every operation the daemon binds, and gives each
// of the daemon's operations an authorisation rule and an authentication
// entry.
TEST(MetadataFileTest, DescribesEveryOperationConsistently) {
  M::Metamodel::MetadataContainer mm;
  M::Authentication::MetadataContainer authn;
  M::Cli::MetadataContainer cli;
  ASSERT_EQ(M::ProviderHelper::LoadMetamodelMetadataFile(kMetadata, "zyr_lumo_metamodel", mm),
            nullptr);
  ASSERT_EQ(M::ProviderHelper::LoadAuthnMetadataFile(kMetadata, "zyr_lumo_authentication", authn),
            nullptr);
  ASSERT_EQ(M::ProviderHelper::LoadCliMetadataFile(kMetadata, "zyr_lumo_cli", cli), nullptr);
  Lumo::Authz::AuthzInfo authz;
  std::ifstream in(kMetadata);
  std::vector<std::string> messages;
  ASSERT_TRUE(Lumo::Authz::Metadata::LoadAuthzInfoMetadata::Load(in, authz, nullptr, messages));

  EXPECT_EQ(mm.Services().Ids().size(), 10u);
  EXPECT_EQ(mm.Operations().Ids().size(), 23u);
  EXPECT_EQ(cli.Commands().Ids().size(), 23u);
  EXPECT_EQ(authn.Operations().Ids().size(), 23u);
  const std::set<std::string> attested = {
      "com.tarsel.orna.kms.key_operation.generate_key", "com.tarsel.orna.kms.key_operation.encrypt",
      "com.tarsel.orna.kms.key_operation.decrypt", "com.tarsel.orna.kms.providers.status.get",
      "com.tarsel.orna.kms.status.get"};
  for (const std::string& method : mm.Operations().Ids()) {
    SCOPED_TRACE(method);
    EXPECT_NE(authn.Operations().Find(method), nullptr);
    const auto* rule = authz.RequiredEntitlements(method);
    ASSERT_NE(rule, nullptr);
    std::set<std::string> expected = {"@ORNA+KMS_ADMIN"};
    if (attested.count(method)) expected.insert("@ATTEST+KEY_OPERATIONS");
    EXPECT_EQ(std::set<std::string>(rule->begin(), rule->end()), expected);
  }
}

TEST(ProviderAssemblyTest, MissingMetadataStopsStartUp) {
  Zyrd::ZyrApi::ProviderDependencies deps;
  deps.metadataPath = "/nonexistent/zyr_lumo_metadata.json";
  EXPECT_DEATH(
      Zyrd::ZyrApi::CreateLocalProvider([](std::function<void()> t) { t(); }, nullptr, deps),
      "Error loading file: Unable to load metadata from /nonexistent/zyr_lumo_metadata.json");
}

TEST(ProviderAssemblyTest, AuditRecordWithoutItsFourAttributesStopsTheProcess) {
  EXPECT_DEATH(Zyrd::ZyrApi::WriteAuditRecord(
                   {{"eventID", "api.call"}, {"subject", ""}, {"result", "true"}}),
               "VERIFY api/provider");
}

}  // namespace
