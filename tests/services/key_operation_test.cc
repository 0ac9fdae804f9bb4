#include <gtest/gtest.h>

#include "services/key_operation_impl.h"
#include "services/status_impl.h"
#include "tests/support/fake_kms.h"
#include "tests/support/fakes.h"
#include "tests/support/log_capture.h"
#include "tests/support/service_calls.h"

namespace {

using Com::Tarsel::Orna::Kms::KeyOperationSvc::DecryptResult;
using Com::Tarsel::Orna::Kms::KeyOperationSvc::EncryptResult;
using Com::Tarsel::Orna::Kms::KeyOperationSvc::GeneratedKey;
using Com::Tarsel::Orna::Kms::KeyOperationSvc::KeyOperationImpl;
using Lumo::Core::MethodResult;
using ZyrdTest::Describe;
using ZyrdTest::FakeKms;
using ZyrdTest::RunOp;
using namespace Zyrd::Kms;

class KeyOperationTest : public ::testing::Test {
 protected:
  std::shared_ptr<FakeKms> AddProvider(const std::string& name,
                                       std::vector<FakeKms::Server> servers) {
    auto kms = std::make_shared<FakeKms>(std::move(servers));
    providers_->Add(name, kms);
    return kms;
  }
  MethodResult Generate(const std::string& provider, int64_t size) {
    return RunOp<GeneratedKey>([&](auto r) { impl_.generate_key(provider, size, r); });
  }
  MethodResult Decrypt(const std::string& provider, const std::string& wrapped) {
    return RunOp<DecryptResult>([&](auto r) { impl_.decrypt(provider, wrapped, r); });
  }

  ZyrdTest::LogCapture log_;
  ZyrdTest::FakeClock clock_;
  Zyrd::Stats::KeyStats stats_{clock_};
  std::shared_ptr<ZyrdTest::FakeProviders> providers_ = std::make_shared<ZyrdTest::FakeProviders>();
  KeyOperationImpl impl_{providers_, stats_};
};

TEST_F(KeyOperationTest, FirstServerThatSucceedsAnswersAfterOneWarningPerFailure) {
  auto kms = AddProvider("p1", {{"s1", KeyServerTimeout}, {"s2"}, {"s3"}});
  MethodResult r = Generate("p1", 32);
  EXPECT_EQ(Describe(r), R"(output {"wrappedKey":"wrapped-by-s2","key":"a2V5LWZyb20ts2"})");
  EXPECT_EQ(kms->asked, (std::vector<uint32_t>{0, 1}));
  EXPECT_EQ(kms->keyLengths, (std::vector<uint32_t>{32, 32}));
  EXPECT_TRUE(log_.Has(
      3, "GenerateKey failed on provider p1 server s1 scripted failure, trying next server\n"));
  EXPECT_EQ(log_.Count("trying next server"), 1u);
  EXPECT_EQ(stats_.Snapshot().successCount, 1u);

  EXPECT_EQ(Describe(Decrypt("p1", "w")), R"(output {"key":"plain-of-w"})");
  EXPECT_EQ(stats_.Snapshot().successCount, 2u);
}

TEST_F(KeyOperationTest, WhenEveryServerFailsTheLastServersErrorIsReported) {
  auto kms = AddProvider("p1", {{"s1", KeyServerTimeout, KeyServerTimeout},
                                {"s2", MasterKeyNotFound, MetadataFailure}});
  EXPECT_EQ(Describe(Generate("p1", 32)),
            "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.master_key_not_found server=s2");
  EXPECT_EQ(Describe(Decrypt("p1", "garbage")),
            "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.keyoperationsvc.decrypt.error "
            "server=s2");
  EXPECT_TRUE(log_.Has(
      3, "Decrypt failed on provider p1 server s1 scripted failure, trying next server\n"));
  EXPECT_TRUE(log_.Has(
      3, "Decrypt failed on provider p1 server s2 scripted failure, trying next server\n"));
  EXPECT_EQ(kms->asked, (std::vector<uint32_t>{0, 1, 0, 1}));
  EXPECT_EQ(stats_.Snapshot().failureCount, 2u);
}

TEST_F(KeyOperationTest, DeactivatedMasterKeyStillDecrypts) {
  AddProvider("p1", {{"s1", MasterKeyUnusableForEncryption, Ok}});
  EXPECT_EQ(
      Describe(Generate("p1", 16)),
      "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.master_key_unusable_for_encryption "
      "server=s1");
  EXPECT_TRUE(Decrypt("p1", "w").IsOutput());
}

// An empty provider is refused before any lookup; an unknown one is not
// found; one without servers fails without addressing a server.
TEST_F(KeyOperationTest, ProvidersThatCannotAnswer) {
  auto kms = AddProvider("empty", {});
  const std::string invalid =
      "com.tarsel.lumo.std.errors.invalid_argument com.tarsel.orna.kms.providers.invalid_argument "
      "parameter=provider";
  const std::string notFound =
      "com.tarsel.lumo.std.errors.not_found com.tarsel.orna.kms.providers.not_found provider=nope";
  EXPECT_EQ(Describe(Generate("", 32)), invalid);
  EXPECT_EQ(Describe(Decrypt("", "w")), invalid);
  EXPECT_EQ(providers_->lookups, 0u);

  MethodResult r = Generate("nope", 32);
  EXPECT_EQ(Describe(r), notFound);
  EXPECT_EQ(r.error->Messages()[0].defaultMessage, "The provider 'nope' does not exist.");
  EXPECT_EQ(Describe(Decrypt("nope", "w")), notFound);

  EXPECT_EQ(
      Describe(Generate("empty", 32)),
      "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.keyoperationsvc.generatekey.error");
  EXPECT_EQ(Describe(Decrypt("empty", "w")),
            "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.keyoperationsvc.decrypt.error");
  EXPECT_TRUE(kms->asked.empty());
  EXPECT_EQ(stats_.Snapshot().failureCount, 6u);
}

TEST_F(KeyOperationTest, KeySizeOutsideOneTo65535IsRefusedBeforeAnyServer) {
  auto kms = AddProvider("p1", {{"s1"}});
  for (int64_t size : {int64_t{0}, int64_t{-1}, int64_t{65536}, int64_t{4294967296}}) {
    SCOPED_TRACE(size);
    EXPECT_EQ(Describe(Generate("p1", size)),
              "com.tarsel.lumo.std.errors.invalid_argument "
              "com.tarsel.orna.kms.providers.invalid_argument "
              "parameter=keySize");
  }
  EXPECT_EQ(providers_->lookups, 0u);
  EXPECT_TRUE(kms->asked.empty());
  EXPECT_EQ(stats_.Snapshot().failureCount, 4u);

  EXPECT_TRUE(Generate("p1", 1).IsOutput());
  EXPECT_TRUE(Generate("p1", 65535).IsOutput());
  EXPECT_EQ(kms->keyLengths, (std::vector<uint32_t>{1, 65535}));
}

TEST_F(KeyOperationTest, EncryptIsTheBareErrorAndIsNotCounted) {
  MethodResult r = RunOp<EncryptResult>([&](auto res) { impl_.encrypt(res); });
  ASSERT_FALSE(r.IsOutput());
  EXPECT_EQ(r.error->Name(), "com.tarsel.lumo.std.errors.error");
  EXPECT_EQ(*r.error->Type(), Lumo::Data::ErrorType::kError);
  EXPECT_TRUE(r.error->Messages().empty());
  EXPECT_EQ(stats_.Snapshot().failureCount + stats_.Snapshot().successCount, 0u);
}

TEST(StatusImplTest, AlwaysHealthyWithoutMessages) {
  Com::Tarsel::Orna::Kms::StatusSvc::StatusImpl impl;
  MethodResult r = RunOp<Com::Tarsel::Orna::Kms::StatusSvc::Info>([&](auto res) { impl.get(res); });
  EXPECT_EQ(Describe(r), R"(output {"health":"HEALTHY","details":"","messages":[]})");
}

}  // namespace
