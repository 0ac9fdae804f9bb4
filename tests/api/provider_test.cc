// The assembled API provider driven through the JSON-RPC handler with JSON
// bodies, as the HTTP transport drives it.
#include "api/provider.h"

#include <gtest/gtest.h>

#include <boost/json/parse.hpp>
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

  // Posts one JSON-RPC call; returns the parsed response body.
  value Post(const std::string& method, const std::string& params, const std::string& token = "") {
    Lumo::Transport::HttpCallResult result = chain_->Send(
        R"({"jsonrpc":"2.0","id":1,"method":")" + method + R"(","params":)" + params + "}", token);
    value body = boost::json::parse(result.body);
    lastErrorName_ = result.errorName;
    return body;
  }
  // The error name of a call, or "ok".
  std::string Outcome(const std::string& method, const std::string& params,
                      const std::string& token = "") {
    value body = Post(method, params, token);
    if (const value* error = body.at("result").as_object().if_contains("error")) {
      EXPECT_EQ(lastErrorName_, error->at("name").as_string());
      return std::string(error->at("name").as_string());
    }
    return "ok";
  }
  std::string Attest() { return ZyrdTest::TokenBuilder::Valid(kNow).Sign(); }

  ZyrdTest::LogCapture log_{5};
  ZyrdTest::FakeClock clock_;
  Zyrd::Stats::KeyStats stats_{clock_};
  AuditLines audit_;
  std::shared_ptr<ZyrdTest::FakeProviders> providers_ = std::make_shared<ZyrdTest::FakeProviders>();
  std::unique_ptr<ZyrdTest::ApiChain> chain_;
  std::string lastErrorName_;
};

constexpr const char* kGenerate = "com.tarsel.orna.kms.key_operation.generate_key";
constexpr const char* kDecrypt = "com.tarsel.orna.kms.key_operation.decrypt";

TEST_F(ApiProviderTest, AttestedCallerGeneratesAndDecryptsAKey) {
  value generated = Post(kGenerate, R"({"provider":"p1","keySize":32})", Attest());
  const value& out = generated.at("result").at("output");
  EXPECT_EQ(out.at("wrappedKey").as_string(), "wrapped-by-s2");
  EXPECT_EQ(out.at("key").as_string(), "a2V5LWZyb20ts2");

  value decrypted = Post(kDecrypt, R"({"provider":"p1","wrappedKey":"wrapped-by-s2"})", Attest());
  EXPECT_EQ(decrypted.at("result").at("output").at("key").as_string(), "plain-of-wrapped-by-s2");
  EXPECT_EQ(log_.Count("GenerateKey failed on provider p1 server s1"), 1u);

  ASSERT_EQ(audit_.lines.size(), 2u);
  const value& record = audit_.lines[0];
  EXPECT_EQ(record.at("eventId").as_string(), "api.call");
  EXPECT_EQ(record.at("subject").as_string(), "<ATTEST>");
  EXPECT_EQ(record.at("object").as_string(), "com.tarsel.orna.kms.key_operation:generate_key");
  EXPECT_EQ(record.at("success").as_bool(), true);
  EXPECT_NE(record.at("opId").as_string(), audit_.lines[1].at("opId").as_string());
}

TEST_F(ApiProviderTest, ServiceErrorsReachTheCallerAndAreAuditedAsFailures) {
  value body = Post(kGenerate, R"({"provider":"","keySize":32})", Attest());
  EXPECT_EQ(body.at("result").at("error").at("messages").at(0).at("args").at("parameter"),
            "provider");
  EXPECT_EQ(lastErrorName_, "com.tarsel.lumo.std.errors.invalid_argument");
  EXPECT_EQ(Outcome(kGenerate, R"({"provider":"p9","keySize":32})", chain_->AdminToken()),
            "com.tarsel.lumo.std.errors.not_found");
  EXPECT_EQ(Outcome("com.tarsel.orna.kms.key_operation.encrypt", R"({"plaintext":"x"})", Attest()),
            "com.tarsel.lumo.std.errors.error");
  ASSERT_EQ(audit_.lines.size(), 3u);
  for (const auto& record : audit_.lines) EXPECT_EQ(record.at("success").as_bool(), false);
  EXPECT_EQ(audit_.lines[1].at("subject").as_string(), "root");
}

TEST_F(ApiProviderTest, AuthenticationAndAuthorisationOutcomes) {
  const std::string list = "com.tarsel.orna.kms.providers.list";
  EXPECT_EQ(Outcome(kGenerate, R"({"provider":"p1","keySize":32})"),
            "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(Outcome(kGenerate, R"({"provider":"p1","keySize":32})", "not-a-token"),
            "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(Outcome(kGenerate, R"({"provider":"p1","keySize":32})",
                    ZyrdTest::TokenBuilder::Valid(kNow).Exp(kNow - 1).Sign()),
            "com.tarsel.lumo.std.errors.unauthenticated");
  EXPECT_EQ(Outcome(kGenerate, R"({"provider":"p1","keySize":32})", chain_->AdminToken()), "ok");
  EXPECT_EQ(Outcome("com.tarsel.orna.kms.status.get", "{}", Attest()), "ok");
  EXPECT_EQ(Outcome(list, "{}", Attest()), "com.tarsel.lumo.std.errors.unauthorized");
  // Described by the metadata, served by a later build.
  EXPECT_EQ(Outcome(list, "{}", chain_->AdminToken()),
            "com.tarsel.lumo.std.errors.operation_not_found");
  EXPECT_EQ(Outcome("com.tarsel.orna.kms.nothing.here", "{}", chain_->AdminToken()),
            "com.tarsel.lumo.std.errors.unauthorized");
  EXPECT_EQ(audit_.lines.back().at("object").as_string(), "com.tarsel.orna.kms.nothing:here");
}

TEST_F(ApiProviderTest, MetadataAndIntrospectionNeedNoToken) {
  value services = Post("com.tarsel.lumo.metadata.metamodel.service.list", "{}");
  EXPECT_EQ(services.at("result").at("output").as_array().size(), 10u);
  value provider = Post("com.tarsel.lumo.std.introspection.provider.get", "{}");
  EXPECT_EQ(provider.at("result").at("output").at("id").as_string(), "AsyncLocalProvider");
  value op = Post("com.tarsel.lumo.std.introspection.operation.get",
                  R"({"serviceId":"com.tarsel.orna.kms.key_operation","operationId":"decrypt"})");
  EXPECT_EQ(op.at("result").at("output").at("params").at(1).at("name").as_string(), "wrappedKey");
}

TEST_F(ApiProviderTest, InputsThatDoNotFitTheOperationAreInvalidParams) {
  value body = Post(kGenerate, R"({"provider":"p1","keysize":32})", Attest());
  EXPECT_EQ(body.at("error").at("code").as_int64(), -32602);
  EXPECT_EQ(body.at("error").at("message").as_string(), "Invalid params: field 'keySize': missing");
  body = Post(kGenerate, R"({"provider":"p1","keySize":"32"})", Attest());
  EXPECT_EQ(body.at("error").at("message").as_string(),
            "Invalid params: field 'keySize': expected an integer");
  ASSERT_EQ(audit_.lines.size(), 2u);
  EXPECT_EQ(audit_.lines[1].at("success").as_bool(), false);
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
