// How the provider status service condenses a client's status into health
// and messages, for the cases a real daemon reaches only with faults.
#include <gtest/gtest.h>

#include "errors/error_builders.h"
#include "platform/ssl/ssl_utils.h"
#include "services/provider_status_impl.h"
#include "tests/support/fake_kms.h"
#include "tests/support/log_capture.h"
#include "tests/support/service_calls.h"
#include "tests/support/test_certs.h"

namespace {

namespace Svc = Com::Tarsel::Orna::Kms::Providers::StatusSvc;
using Zyrd::Kms::ServerStatus;

const std::string kStatus = "com.tarsel.orna.kms.providers.statussvc.";

class ProviderStatusTest : public ::testing::Test {
 protected:
  ProviderStatusTest() {
    kms_->status.masterKeyFound = kms_->status.masterKeyUsable = kms_->status.keySizeSupported =
        true;
    kms_->status.servers = {Trusting(), Trusting()};
    providers_->Add("p", kms_);
    activation_.requestLocalizer = std::shared_ptr<const Lumo::L10n::Localizer>(
        &Zyrd::ZyrApi::CatalogueLocalizer(), [](const Lumo::L10n::Localizer*) {});
  }
  static ServerStatus Trusting() { return {true, true, {}}; }

  // "<health> [message ids] | <server health> [its message ids] | ..."
  std::string Status() {
    auto r = ZyrdTest::RunOp<Svc::Info>([&](auto res) { impl_.get("p", activation_, res); });
    const auto& info = r.output.as_object();
    auto describe = [](const boost::json::object& o) {
      std::string out(o.at("health").as_string());
      for (const auto& m : o.at("messages").as_array()) {
        std::string id(m.at("id").as_string());
        out += " " + (id.rfind(kStatus, 0) == 0 ? id.substr(kStatus.size()) : id);
      }
      return out;
    };
    std::string out = describe(info);
    for (const auto& s : info.at("servers").as_array()) out += " | " + describe(s.as_object());
    return out;
  }

  ZyrdTest::LogCapture log_;
  std::shared_ptr<ZyrdTest::FakeKms> kms_ =
      std::make_shared<ZyrdTest::FakeKms>(std::vector<ZyrdTest::FakeKms::Server>{{"a"}, {"b"}});
  std::shared_ptr<ZyrdTest::FakeProviders> providers_ = std::make_shared<ZyrdTest::FakeProviders>();
  Lumo::Core::AsyncActivation activation_;
  Svc::StatusImpl impl_{providers_};
};

TEST_F(ProviderStatusTest, ServerAndProviderHealth) {
  Groundwork::SecureString key;
  std::string tenYears;
  ASSERT_TRUE(Kestrel::Common::SslUtils::GenerateKeyAndCert(key, tenYears));
  const std::string oneDay = ZyrdTest::MakeSelfSignedCert("client").certificatePem;
  // No trusted certificates: every server warns, so the client certificate
  // is not looked at.
  EXPECT_EQ(Status(),
            "WARNING | WARNING trusted_server_certificates.unknown | "
            "WARNING trusted_server_certificates.unknown");

  // One server presents a trusted certificate, the other none; then the
  // client certificate decides.
  kms_->trusted = {oneDay, tenYears};
  kms_->presented = {tenYears, ""};
  const std::string servers = " | HEALTHY | WARNING server_certificate_unknown_expiry get.error";
  EXPECT_EQ(Status(), "WARNING client_certificate_unknown_expiry" + servers);
  kms_->clientCert = oneDay;
  EXPECT_EQ(Status(), "WARNING client_certificate_expiring" + servers);
  kms_->clientCert = tenYears;
  EXPECT_EQ(Status(), "HEALTHY" + servers);

  // A server the daemon cannot trust is in error; without a usable master
  // key, so is the provider, with one message per server asked.
  kms_->status.servers[1] = {
      false, true, {{kStatus + "client_not_trusting_server", Zyrd::Kms::KeyServerTimeout}}};
  kms_->status.masterKeyFound = false;
  kms_->status.masterKeyErrors = {Zyrd::Kms::MasterKeyNotFound, Zyrd::Kms::KeyServerTimeout};
  EXPECT_EQ(Status(),
            "ERROR com.tarsel.orna.kms.master_key_not_found com.tarsel.orna.kms.key_server_timeout"
            " | HEALTHY | ERROR client_not_trusting_server com.tarsel.orna.kms.key_server_timeout");
}

}  // namespace
