#include "state/providers.h"

#include <gtest/gtest.h>

#include <set>

#include "daemon/settings.h"
#include "platform/runtime/config.h"
#include "tests/support/fake_kms.h"
#include "tests/support/fakes.h"
#include "tests/support/log_capture.h"

namespace {

using Zyrd::Kms::KmsInfo;
using ZyrdTest::FakeKms;

class FakeBackend : public Zyrd::State::ProvidersBackend {
 public:
  int ReadClientConfig(const std::string& name, std::shared_ptr<const KmsInfo>& info) override {
    ++reads;
    if (!providers.count(name)) return 3;
    info = std::make_shared<KmsInfo>();
    return 0;
  }
  int ListProviderIds(std::vector<std::string>& ids) override {
    if (listFails) return 2;
    for (const auto& name : providers) ids.push_back(name);
    return 0;
  }
  std::shared_ptr<Zyrd::Kms::Kms> MakeClient(std::shared_ptr<const KmsInfo>) override {
    made.push_back(std::make_shared<FakeKms>(std::vector<FakeKms::Server>{}));
    return made.back();
  }
  UserLock::RWLock& ConfigLock() override { return *configLock; }

  std::set<std::string> providers{"p1", "p2"};
  bool listFails = false;
  int reads = 0;
  std::vector<std::shared_ptr<FakeKms>> made;
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
  Zyrd::State::Providers state_{backend_, clock_};
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

  Configure(
      "<statusUpdateIntervalSeconds>7200</statusUpdateIntervalSeconds>"
      "<cacheStaleTimeoutSeconds>5000</cacheStaleTimeoutSeconds>");
  EXPECT_EQ(scheduler_.LastDelay(), std::chrono::seconds(3600));
  EXPECT_EQ(state_.Settings().cacheStaleTimeoutSeconds, 3600);
}

TEST_F(ProvidersTest, FreshCacheReturnsTheSameClientAndUnknownProvidersChangeNothing) {
  Configure();
  auto a = state_.GetProvider("p1");
  ASSERT_NE(a, nullptr);
  EXPECT_EQ(state_.GetProvider("p1"), a);
  EXPECT_EQ(backend_.reads, 1);
  EXPECT_EQ(state_.GetProvider("nope"), nullptr);
  EXPECT_EQ(state_.Size(), 1u);
}

TEST_F(ProvidersTest, StaleCacheIsDroppedWholeAndRebuilt) {
  Configure();  // stale timeout 1800 s
  auto p1 = state_.GetProvider("p1");
  state_.GetProvider("p2");
  clock_.AdvanceUs(1800ull * 1000000);
  EXPECT_EQ(state_.GetProvider("p1"), p1);  // exactly the timeout is still fresh
  clock_.AdvanceUs(1000000);
  EXPECT_NE(state_.GetProvider("p1"), p1);
  EXPECT_EQ(state_.Size(), 1u);  // p2 went with the stale cache
}

TEST_F(ProvidersTest, CachingOffBuildsAFreshClientEveryTime) {
  Configure("<caching>false</caching>");
  EXPECT_EQ(scheduler_.Pending(), 0u);
  auto a = state_.GetProvider("p1");
  ASSERT_NE(a, nullptr);
  EXPECT_NE(state_.GetProvider("p1"), a);
  EXPECT_EQ(state_.Size(), 0u);
}

TEST_F(ProvidersTest, DeleteDropsOnlyThatProvider) {
  Configure();
  auto p1 = state_.GetProvider("p1");
  auto p2 = state_.GetProvider("p2");
  state_.DeleteProviderFromState("p1");
  EXPECT_NE(state_.GetProvider("p1"), p1);
  EXPECT_EQ(state_.GetProvider("p2"), p2);
  // A request still holding the dropped client keeps a valid object.
  EXPECT_EQ(p1->GetServerCount(), 0u);
}

// The update adds what is missing, refreshes every client, renews the cache
// age and always re-arms itself.
TEST_F(ProvidersTest, StatusUpdateRefreshesEveryProviderAndRearms) {
  Configure();
  auto p1 = state_.GetProvider("p1");
  clock_.AdvanceUs(1700ull * 1000000);
  ASSERT_TRUE(scheduler_.RunNext());
  ASSERT_EQ(backend_.made.size(), 2u);  // p1 existed, p2 was added
  for (const auto& client : backend_.made) EXPECT_EQ(client->updates, 1);
  clock_.AdvanceUs(1700ull * 1000000);
  EXPECT_EQ(state_.GetProvider("p1"), p1);
  EXPECT_EQ(scheduler_.Pending(), 1u);

  backend_.listFails = true;
  ASSERT_TRUE(scheduler_.RunNext());
  EXPECT_EQ(backend_.made.size(), 2u);
  EXPECT_EQ(scheduler_.Pending(), 1u);
}

}  // namespace
