// The library against a real KMIP server (PyKMIP). One server and one set of
// keys serve every test here, because starting the server costs a second.
#include <gtest/gtest.h>

#include <memory>

#include "tests/kmip/kmip_test_util.h"

namespace {

using KmipTest::Config;
using KmipTest::Connection;
using KmipTest::Pki;
using KmipTest::Take;

struct Keys {
  std::string aes128, aes256, preActive, deactivated, compromised;
};

class PyKmipTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    server_ = new ZyrdTest::PyKmipServer(Pki());
    if (!server_->started()) return;
    std::vector<std::string> ids = server_->Admin({
        {"create", "128"},
        {"activate", "$1"},  // 1
        {"create", "256"},
        {"activate", "$3"},  // 3
        {"create", "128"},   // 5
        {"create", "128"},
        {"activate", "$6"},
        {"revoke", "$6", "deactivated"},  // 6
        {"create", "128"},
        {"activate", "$9"},
        {"revoke", "$9", "compromised"},  // 9
    });
    if (ids.size() == 11) keys_ = {ids[0], ids[2], ids[4], ids[5], ids[8]};
  }
  static void TearDownTestSuite() {
    delete server_;
    server_ = nullptr;
  }
  void SetUp() override {
    ASSERT_TRUE(server_->started()) << server_->error();
    ASSERT_FALSE(keys_.aes128.empty()) << server_->error();
  }
  static Qlc::SessionConfig Trusting(const std::string& client = "client") {
    return Config("127.0.0.1", server_->port(), {"ca"}, client);
  }
  static std::string Hex(const unsigned char* p, int n) {
    static const char* d = "0123456789abcdef";
    std::string s;
    for (int i = 0; i < n; ++i) {
      s.push_back(d[p[i] >> 4]);
      s.push_back(d[p[i] & 15]);
    }
    return s;
  }

  static ZyrdTest::PyKmipServer* server_;
  static Keys keys_;
};

ZyrdTest::PyKmipServer* PyKmipTest::server_ = nullptr;
Keys PyKmipTest::keys_;

TEST_F(PyKmipTest, VersionsKeysAndStates) {
  Connection c(Trusting());
  ASSERT_EQ(c.number, 0) << c.explanation;

  qlc_result* r = qlc_perform(c.session, "Query, Versions");
  ASSERT_EQ(qlc_ok(r), 0) << qlc_explain(r);
  std::vector<std::string> versions = KmipTest::VersionTexts(r);
  qlc_release(r);
  EXPECT_EQ(versions, (std::vector<std::string>{"2.0", "1.4", "1.3", "1.2", "1.1", "1.0"}));

  std::vector<std::string> held = server_->Admin({{"get", keys_.aes128}, {"get", keys_.aes256}});
  ASSERT_EQ(held.size(), 2u) << server_->error();
  const std::pair<std::string, int> keys[] = {{keys_.aes128, 16}, {keys_.aes256, 32}};
  for (size_t i = 0; i < 2; ++i) {
    r = qlc_perform(c.session, "Get, Object, Id=%s", keys[i].first.c_str());
    unsigned char* bytes = nullptr;
    int length = 0;
    ASSERT_EQ(qlc_value_of("Symmetric_Key/Key", r, "bs", &bytes, &length), 0) << qlc_explain(r);
    EXPECT_EQ(length, keys[i].second);
    EXPECT_EQ(Hex(bytes, length), held[i]);
    qlc_free(bytes);
    qlc_release(r);
  }

  const std::pair<std::string, int> states[] = {
      {keys_.aes128, 2}, {keys_.preActive, 1}, {keys_.deactivated, 3}, {keys_.compromised, 4}};
  for (const auto& [id, expected] : states) {
    r = qlc_perform(c.session, "Get, Attributes, Id=%s, Names=State", id.c_str());
    int state = 0;
    EXPECT_EQ(qlc_value_of("Attributes/State", r, "d", &state), 0) << qlc_explain(r);
    EXPECT_EQ(state, expected) << "key " << id;
    qlc_release(r);
  }

  // The credential options are accepted.
  auto o = Take(qlc_perform(c.session,
                            "Get, Attributes, Id=%s, Names=State, "
                            "Options={Authentication={User=%s, Password=%s}}",
                            keys_.aes128.c_str(), "operator", "secret"));
  EXPECT_EQ(o.number, 0) << o.explanation;

  o = Take(qlc_perform(c.session, "Get, Object, Id=%s", "999999"));
  EXPECT_EQ(o.number, QLC_E_OPERATION_FAILED);
  EXPECT_NE(o.explanation.find("reason 1 (Item Not Found)"), std::string::npos) << o.explanation;
}

TEST_F(PyKmipTest, UntrustedServerGivesItsCertificate) {
  Connection c(Config("127.0.0.1", server_->port(), {"other_ca"}));
  EXPECT_EQ(c.number, QLC_E_UNTRUSTED_SERVER) << c.explanation;
  EXPECT_EQ(c.fetch, 0);
  EXPECT_EQ(c.format, QLC_CERT_FORMAT_PEM);
  EXPECT_EQ(c.serverCert, Pki().Pem("server"));
  EXPECT_EQ(c.session, nullptr);
}

TEST_F(PyKmipTest, ClientsTheServerDoesNotAccept) {
  // A certificate from a CA the server does not trust fails the handshake.
  Connection stranger(Trusting("other_client"));
  EXPECT_EQ(stranger.number, QLC_E_COMMUNICATION) << stranger.explanation;

  // No client certificate at all.
  Connection anonymous(Trusting(""));
  if (anonymous.number == 0) {
    EXPECT_EQ(Take(qlc_perform(anonymous.session, "Query, Versions")).number, QLC_E_COMMUNICATION);
  } else {
    EXPECT_EQ(anonymous.number, QLC_E_COMMUNICATION) << anonymous.explanation;
  }

  // Without the clientAuth usage every request fails with reason 3.
  Connection noeku(Trusting("noeku"));
  ASSERT_EQ(noeku.number, 0) << noeku.explanation;
  auto o = Take(qlc_perform(noeku.session, "Query, Versions"));
  EXPECT_EQ(o.number, QLC_E_OPERATION_FAILED);
  EXPECT_NE(o.explanation.find("reason 3 (Authentication Not Successful)"), std::string::npos)
      << o.explanation;

  // Another CN does not own the keys.
  Connection other(Trusting("client2"));
  ASSERT_EQ(other.number, 0) << other.explanation;
  o = Take(qlc_perform(other.session, "Get, Object, Id=%s", keys_.aes128.c_str()));
  EXPECT_EQ(o.number, QLC_E_OPERATION_FAILED);
  EXPECT_NE(o.explanation.find("reason 12 (Permission Denied)"), std::string::npos)
      << o.explanation;
}

}  // namespace
