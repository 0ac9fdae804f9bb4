// Failure paths of the providers and raw configuration services that a real
// daemon cannot be driven into: store writes and firewall changes that fail.
#include <gtest/gtest.h>

#include "config/config_transfer.h"
#include "platform/ssl/gzip.h"
#include "services/providers_impl.h"
#include "services/raw_config_impl.h"
#include "tests/config/config_fixture.h"
#include "tests/support/fake_kms.h"
#include "tests/support/fakes.h"
#include "tests/support/service_calls.h"

namespace {

namespace Svc = Com::Tarsel::Orna::Kms::ProvidersSvc;
namespace Raw = Com::Tarsel::Orna::Kms::RawConfigSvc;
using Strings = std::vector<std::string>;
using ZyrdTest::Describe;
using ZyrdTest::RunOp;
using ZyrdTest::ThrowingStore;

const std::string kStoreError =
    "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.providers.config_store_error";

Svc::CreateSpec Spec(const std::string& name, const Strings& hosts) {
  Svc::CreateSpec spec{name, "mk", {}};
  for (const auto& host : hosts) spec.keyServer.kmipServer.servers.push_back({host, {host, {}}});
  return spec;
}

class ProvidersServiceTest : public ZyrdTest::ConfigTest {
 protected:
  std::string Create(const Svc::CreateSpec& spec) {
    return Describe(RunOp<void>([&](auto r) { impl_.create(spec, r); }));
  }
  std::string Update(const std::string& name, const Svc::UpdateSpec& spec) {
    return Describe(RunOp<void>([&](auto r) { impl_.update(name, spec, r); }));
  }
  Strings Ids() {
    Strings ids;
    EXPECT_EQ(Zyrd::Config::ListProviderIds(ids), 0);
    return ids;
  }

  ZyrdTest::RecordingFirewall host_;
  Zyrd::State::Firewall firewall_{host_};
  std::shared_ptr<ZyrdTest::FakeProviders> providers_ = std::make_shared<ZyrdTest::FakeProviders>();
  Svc::ProvidersImpl impl_{providers_, firewall_};
};

TEST_F(ProvidersServiceTest, AFailedCreateWithdrawsOnlyTheHostsItAdded) {
  ASSERT_EQ(Create(Spec("other", {"shared"})), "output null");
  host_.calls.clear();
  store_->FailOn(ThrowingStore::kWrite);
  EXPECT_EQ(Create(Spec("p", {"shared", "own"})), kStoreError);
  EXPECT_EQ(host_.calls, (Strings{"+own", "-own"}));
  EXPECT_EQ(Ids(), Strings{"other"});
}

TEST_F(ProvidersServiceTest, AFirewallFailureStoresNothing) {
  host_.failOn = {2};
  EXPECT_EQ(Create(Spec("p", {"a", "b"})),
            "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.providers.firewall_error");
  EXPECT_EQ(host_.calls, (Strings{"+a", "+b", "-a"}));
  EXPECT_TRUE(Ids().empty());
}

TEST_F(ProvidersServiceTest, AFailedUpdateRestoresTheFirewallAndKeepsTheClient) {
  ASSERT_EQ(Create(Spec("p", {"a"})), "output null");
  providers_->Add("p",
                  std::make_shared<ZyrdTest::FakeKms>(std::vector<ZyrdTest::FakeKms::Server>{}));
  host_.calls.clear();
  Svc::UpdateSpec moveToB;
  moveToB.keyServer.emplace().kmipServer.emplace().servers = {{"s", {"b", 7000}}};
  store_->FailOn(ThrowingStore::kWrite);
  EXPECT_EQ(Update("p", moveToB), kStoreError);
  EXPECT_EQ(host_.calls, (Strings{"+b", "-a", "+a", "-b"}));
  EXPECT_TRUE(providers_->dropped.empty());
}

TEST_F(ProvidersServiceTest, AMasterKeyChangeKeepsHostsAndServersAndDropsTheClient) {
  ASSERT_EQ(Create(Spec("p", {"a"})), "output null");
  host_.calls.clear();
  Svc::UpdateSpec newKey;
  newKey.masterKeyId = "mk2";
  EXPECT_EQ(Update("p", newKey), "output null");
  EXPECT_TRUE(host_.calls.empty());
  EXPECT_EQ(providers_->dropped, Strings{"p"});
  Strings hosts;
  std::string proxy;
  ASSERT_EQ(Zyrd::Config::GetProviderHosts("p", true, true, hosts, proxy), 0);
  EXPECT_EQ(hosts, Strings{"a"});
}

class RawConfigServiceTest : public ProvidersServiceTest {
 protected:
  std::string Set(const std::string& text) {
    Groundwork::SecureString gz;
    EXPECT_TRUE(Kestrel::Common::Gzip::CompressFromString(text, gz));
    Groundwork::SecureBytes bytes(gz.data(), gz.data() + gz.size());
    return Describe(RunOp<void>([&](auto r) { raw_.set(bytes, r); }));
  }
  Raw::RawConfigImpl raw_{providers_};
};

TEST_F(RawConfigServiceTest, OnlyASuccessfulImportDropsTheClients) {
  ASSERT_EQ(Create(Spec("p", {"a"})), "output null");
  std::string text, digest;
  ASSERT_EQ(Zyrd::Config::ExportConfig(text, digest), 0);
  store_->FailOn(ThrowingStore::kImport);
  EXPECT_EQ(Set(text),
            "com.tarsel.lumo.std.errors.error com.tarsel.orna.kms.raw_config.config_store_error");
  EXPECT_TRUE(providers_->dropped.empty());

  OrnaConfigStore::ConfigStore::SetGlobalStore(real_);
  EXPECT_EQ(Set(text), "output null");
  EXPECT_EQ(providers_->dropped, Strings{"*"});
}

}  // namespace
