#include "state/firewall.h"

#include <gtest/gtest.h>

#include "tests/config/config_fixture.h"
#include "tests/support/fakes.h"

namespace {

using Strings = std::vector<std::string>;

class FirewallTest : public ZyrdTest::ConfigTest {
 protected:
  // Stores a provider whose servers use `hosts`.
  void Store(const std::string& name, const Strings& hosts) {
    using namespace Zyrd::Config;
    ProviderConfigObjects o;
    o.name = name;
    ASSERT_EQ(CreateProviderObjects(o), 0);
    for (size_t i = 0; i < hosts.size(); ++i) {
      ASSERT_EQ(AddServer(o, "s" + std::to_string(i), hosts[i], 5696), 0);
    }
    ASSERT_EQ(WriteProvider(o), 0);
  }

  ZyrdTest::RecordingFirewall host_;
  Zyrd::State::Firewall firewall_{host_};
};

TEST_F(FirewallTest, HostsThatAnotherProviderUsesOrThatAreBothAddedAndRemovedStayAsTheyAre) {
  Store("p", {"b.example"});
  Store("other", {"a.example"});
  EXPECT_TRUE(firewall_.Update("p", true, {"b.example", "same"}, {"a.example", "same"}));
  EXPECT_EQ(host_.calls, Strings{"+b.example"});
  EXPECT_TRUE(firewall_.Update("p", true, {"same"}, {"same"}));
  EXPECT_TRUE(firewall_.Update("p", false, {}, {}));
  EXPECT_EQ(host_.calls, Strings{"+b.example"});

  // Without the check every host is acted on, in order.
  EXPECT_TRUE(firewall_.Update("p", false, {"b.example"}, {"a.example"}));
  EXPECT_EQ(host_.calls, (Strings{"+b.example", "+b.example", "-a.example"}));
}

TEST_F(FirewallTest, AFailedAdditionWithdrawsTheEarlierOnesAndRemovesNothing) {
  host_.failOn = {2};
  EXPECT_FALSE(firewall_.Update("p", true, {"h1", "h2", "h3"}, {"old"}));
  EXPECT_EQ(host_.calls, (Strings{"+h1", "+h2", "-h1"}));
  EXPECT_TRUE(log_.Has(2, "Failed to add host h2 to firewall\n"));
}

TEST_F(FirewallTest, AFailedRemovalWithdrawsTheAdditionsAndRestoresTheEarlierRemovals) {
  host_.failOn = {4, 5};  // the third removal, then the first step of the undo
  EXPECT_FALSE(firewall_.Update("p", true, {"n1"}, {"o1", "o2", "o3"}));
  EXPECT_EQ(host_.calls, (Strings{"+n1", "-o1", "-o2", "-o3", "-n1", "+o1", "+o2"}));
  EXPECT_TRUE(log_.Has(2, "Failed to remove host o3 from firewall\n"));
  EXPECT_TRUE(log_.Has(2, "Failed to remove host n1 from firewall\n"));
}

TEST_F(FirewallTest, OpenAndCloseAllActOnEveryHostOfEveryProvider) {
  Store("p1", {"shared", "a"});
  Store("p2", {"shared"});
  CreateProvider("p3");  // servers kms2.example, kms1.example and proxy.example
  firewall_.OpenAll();
  EXPECT_EQ(host_.calls, (Strings{"+shared", "+a", "+shared", "+kms2.example", "+kms1.example",
                                  "+proxy.example"}));
  host_.calls.clear();
  store_->FailOn(ZyrdTest::ThrowingStore::kFilter);
  firewall_.CloseAll();
  EXPECT_TRUE(host_.calls.empty());
  EXPECT_TRUE(log_.Has(3, "Error getting server ips for some or all providers\n"));
}

TEST_F(FirewallTest, AProviderThatCannotBeReadFailsTheCheck) {
  Store("p", {"a"});
  Tamper("p", [](auto& o) { o.servers[0]->SetValue("hostname", 7L); });
  EXPECT_FALSE(firewall_.Update("q", true, {"b"}, {}));
  EXPECT_TRUE(host_.calls.empty());
  EXPECT_TRUE(log_.Has(2, "Update firewall failed to check providers\n"));
}

}  // namespace
