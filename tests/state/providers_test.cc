#include "state/providers.h"

#include <gtest/gtest.h>

#include <map>

#include "daemon/settings.h"
#include "platform/runtime/config.h"
#include "tests/support/fakes.h"
#include "tests/support/log_capture.h"

namespace {

using Zyrd::Kms::KmsInfo;
using Zyrd::State::Providers;

class CountingClient : public Zyrd::Kms::Kms {
 public:
  explicit CountingClient(std::shared_ptr<const KmsInfo> info) : info_(std::move(info)) {}
  uint32_t GetServerCount() override { return static_cast<uint32_t>(info_->servers.size()); }
  Zyrd::Kms::KmsResult GenerateKey(uint32_t, uint32_t, Groundwork::SecureString&, std::string&,
                                   std::string&) override {
    return Zyrd::Kms::Ok;
  }
  Zyrd::Kms::KmsResult Decrypt(uint32_t, const std::string&, Groundwork::SecureString&,
                               std::string&) override {
    return Zyrd::Kms::Ok;
  }
  void GetTrustedServerCertificates(std::vector<std::string>&) override {}
  void GetClientCert(std::string&) override {}
  int GetServerName(uint32_t, std::string&) override { return 0; }
  Zyrd::Kms::KmsResult GetRemoteServerCertificate(uint32_t, std::string&, std::string&) override {
    return Zyrd::Kms::Ok;
  }
  void UpdateStatus() override { ++updates; }
  void GetStatus(Zyrd::Kms::KmsStatus&) override {}

  int updates = 0;
  std::shared_ptr<const KmsInfo> info_;
};

class FakeBackend : public Zyrd::State::ProvidersBackend {
 public:
  int ReadClientConfig(const std::string& name, std::shared_ptr<const KmsInfo>& info) override {
    ++reads;
    auto it = providers.find(name);
    if (it == providers.end()) return 3;
    auto made = std::make_shared<KmsInfo>();
    made->name = name;
    made->masterKeyId = it->second;
    info = made;
    return 0;
  }
  int ListProviderIds(std::vector<std::string>& ids) override {
    if (listFails) return 2;
    for (const auto& [name, key] : providers) ids.push_back(name);
    return 0;
  }
  std::shared_ptr<Zyrd::Kms::Kms> MakeClient(std::shared_ptr<const KmsInfo> info) override {
    auto client = std::make_shared<CountingClient>(std::move(info));
    made.push_back(client);
    return client;
  }
  UserLock::RWLock& ConfigLock() override { return *configLock; }

  std::map<std::string, std::string> providers{{"p1", "k1"}, {"p2", "k2"}};
  bool listFails = false;
  int reads = 0;
  std::vector<std::shared_ptr<CountingClient>> made;
  UserLock::RWLockPtr configLock{"configLock", 0xfeffffff};
};

class ProvidersTest : public ::testing::Test {
 protected:
  void Configure(const std::string& body = "") {
    Strake::Service::Config config;
    Zyrd::Settings::WriteDefaults(config);
    config.MergeXmlText("<config>" + body + "</config>");
    state_.Configure(config, scheduler_);
  }

  ZyrdTest::LogCapture log_;
  ZyrdTest::FakeClock clock_;
  ZyrdTest::ManualScheduler scheduler_;
  FakeBackend backend_;
  Providers state_{backend_, clock_};
};

TEST_F(ProvidersTest, ConfigureClampsAndLogsSettingsAndSchedulesTheUpdate) {
  Configure(
      "<statusUpdateIntervalSeconds>10</statusUpdateIntervalSeconds>"
      "<cacheStaleTimeoutSeconds>0</cacheStaleTimeoutSeconds>");
  EXPECT_EQ(state_.Settings().statusUpdateIntervalSeconds, 60);
  EXPECT_EQ(state_.Settings().cacheStaleTimeoutSeconds, 70);
  EXPECT_TRUE(log_.Has(5, "Status update interval = 60\n"));
  EXPECT_TRUE(log_.Has(5, "Cache stale timeout seconds = 70\n"));
  EXPECT_EQ(scheduler_.LastDelay(), std::chrono::seconds(60));
}

TEST_F(ProvidersTest, LongIntervalsAreLowered) {
  Configure(
      "<statusUpdateIntervalSeconds>7200</statusUpdateIntervalSeconds>"
      "<cacheStaleTimeoutSeconds>5000</cacheStaleTimeoutSeconds>");
  EXPECT_EQ(scheduler_.LastDelay(), std::chrono::seconds(3600));
  EXPECT_EQ(state_.Settings().cacheStaleTimeoutSeconds, 3600);
}

TEST_F(ProvidersTest, FreshCacheReturnsTheSameClient) {
  Configure();
  auto a = state_.GetProvider("p1");
  auto b = state_.GetProvider("p1");
  ASSERT_NE(a, nullptr);
  EXPECT_EQ(a, b);
  EXPECT_EQ(backend_.reads, 1);
  EXPECT_TRUE(log_.Has(5, "Added provider p1 to providers state\n"));
}

TEST_F(ProvidersTest, StaleCacheIsDroppedWholeAndRebuilt) {
  Configure();  // stale timeout 1800 s
  auto p1 = state_.GetProvider("p1");
  state_.GetProvider("p2");
  clock_.AdvanceUs(1800ull * 1000000);
  EXPECT_EQ(state_.GetProvider("p1"), p1);  // exactly the timeout is still fresh
  clock_.AdvanceUs(1000000);
  auto rebuilt = state_.GetProvider("p1");
  EXPECT_NE(rebuilt, p1);
  EXPECT_EQ(state_.Size(), 1u);  // p2 went with the stale cache
  EXPECT_TRUE(log_.Has(5, "Deleted all providers from providers state\n"));
}

TEST_F(ProvidersTest, CachingOffBuildsAFreshClientEveryTime) {
  Configure("<caching>false</caching>");
  EXPECT_EQ(scheduler_.Pending(), 0u);
  auto a = state_.GetProvider("p1");
  auto b = state_.GetProvider("p1");
  ASSERT_NE(a, nullptr);
  EXPECT_NE(a, b);
  EXPECT_EQ(state_.Size(), 0u);
}

TEST_F(ProvidersTest, UnknownProviderYieldsNullAndLeavesTheMapAlone) {
  Configure();
  state_.GetProvider("p1");
  EXPECT_EQ(state_.GetProvider("nope"), nullptr);
  EXPECT_EQ(state_.Size(), 1u);
  EXPECT_TRUE(log_.Has(3, "Error getting provider nope\n"));
}

TEST_F(ProvidersTest, DeleteDropsOnlyThatProvider) {
  Configure();
  auto p1 = state_.GetProvider("p1");
  auto p2 = state_.GetProvider("p2");
  state_.DeleteProviderFromState("p1");
  EXPECT_TRUE(log_.Has(5, "Deleted provider p1 from providers state\n"));
  EXPECT_NE(state_.GetProvider("p1"), p1);
  EXPECT_EQ(state_.GetProvider("p2"), p2);
  // A request still holding the dropped client keeps a valid object.
  EXPECT_EQ(p1->GetServerCount(), 0u);
}

TEST_F(ProvidersTest, StatusUpdateRefreshesEveryProviderAndRearms) {
  Configure();
  auto p1 = state_.GetProvider("p1");
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_TRUE(log_.Has(6, "Updating status\n"));
  ASSERT_EQ(backend_.made.size(), 2u);  // p1 existed, p2 was added
  for (const auto& client : backend_.made) EXPECT_EQ(client->updates, 1);
  EXPECT_EQ(state_.GetProvider("p1"), p1);
  EXPECT_EQ(scheduler_.Pending(), 1u);
}

TEST_F(ProvidersTest, StatusUpdateRearmsEvenWhenListingFails) {
  Configure();
  backend_.listFails = true;
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_TRUE(backend_.made.empty());
  EXPECT_EQ(scheduler_.Pending(), 1u);
}

TEST_F(ProvidersTest, StatusUpdateRenewsTheCacheAge) {
  Configure();
  auto p1 = state_.GetProvider("p1");
  clock_.AdvanceUs(1700ull * 1000000);
  ASSERT_TRUE(scheduler_.RunNext());
  clock_.AdvanceUs(1700ull * 1000000);
  EXPECT_EQ(state_.GetProvider("p1"), p1);
}

}  // namespace
