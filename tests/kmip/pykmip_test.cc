// The library against a real KMIP server (PyKMIP) with the keys its harness
// created.
#include <gtest/gtest.h>

#include "tests/kmip/kmip_test_util.h"

namespace {

using namespace KmipTest;
using ZyrdTest::KmipPort;
using ZyrdTest::TestKey;

TEST(PyKmip, VersionsKeysStatesAndCredentials) {
  Connection c(Config(KmipPort()));
  ASSERT_EQ(c.number, 0) << c.explanation;
  EXPECT_EQ(Perform(c.session, "Query, Versions").Versions(),
            (std::vector<std::string>{"2.0", "1.4", "1.3", "1.2", "1.1", "1.0"}));

  for (const char* name : {"aes128", "aes256"}) {
    auto key = TestKey(name);
    auto r = Perform(c.session, "Get, Object, Id=%s", key.id.c_str());
    EXPECT_EQ(r.Bytes("Symmetric_Key/Key"), key.bytes) << r.explanation();
    EXPECT_EQ(key.bytes.size(), name == std::string("aes128") ? 16u : 32u);
  }
  for (auto [name, state] :
       {std::pair{"aes128", 2}, {"preactive", 1}, {"deactivated", 3}, {"compromised", 4}}) {
    EXPECT_EQ(Perform(c.session, "Get, Attributes, Id=%s, Names=State", TestKey(name).id.c_str())
                  .Int("Attributes/State"),
              state)
        << name;
  }
  auto o = Perform(c.session,
                   "Get, Attributes, Id=%s, Names=State, "
                   "Options={Authentication={User=%s, Password=%s}}",
                   TestKey("aes128").id.c_str(), "operator", "secret");
  EXPECT_EQ(o.number(), 0) << o.explanation();

  auto missing = Perform(c.session, "Get, Object, Id=%s", TestKey("destroyed").id.c_str());
  EXPECT_EQ(missing.number(), QLC_E_OPERATION_FAILED);
  EXPECT_NE(missing.explanation().find("reason 1 (Item Not Found)"), std::string::npos)
      << missing.explanation();
}

TEST(PyKmip, UntrustedServerGivesItsCertificate) {
  Connection c(Config(KmipPort(), {"other_ca"}));
  EXPECT_EQ(c.number, QLC_E_UNTRUSTED_SERVER) << c.explanation;
  EXPECT_EQ(c.fetch, 0);
  EXPECT_EQ(c.format, QLC_CERT_FORMAT_PEM);
  EXPECT_EQ(c.serverCert, PkiPem("server"));
  EXPECT_EQ(c.session, nullptr);
}

TEST(PyKmip, ClientsTheServerDoesNotAccept) {
  // A certificate from a CA the server does not trust fails the handshake.
  Connection stranger(Config(KmipPort(), {"ca"}, "other_client"));
  EXPECT_EQ(stranger.number, QLC_E_COMMUNICATION) << stranger.explanation;

  // No client certificate at all: refused at the handshake or the first read.
  Connection anonymous(Config(KmipPort(), {"ca"}, ""));
  EXPECT_EQ(anonymous.number == 0 ? Perform(anonymous.session, "Query, Versions").number()
                                  : anonymous.number,
            QLC_E_COMMUNICATION);

  // Without the clientAuth usage every request fails with reason 3; another
  // CN does not own the keys (reason 12).
  const std::pair<const char*, const char*> refusals[] = {
      {"noeku", "reason 3 (Authentication Not Successful)"},
      {"client2", "reason 12 (Permission Denied)"}};
  for (auto [client, reason] : refusals) {
    Connection c(Config(KmipPort(), {"ca"}, client));
    ASSERT_EQ(c.number, 0) << c.explanation;
    auto o = Perform(c.session, "Get, Object, Id=%s", TestKey("aes128").id.c_str());
    EXPECT_EQ(o.number(), QLC_E_OPERATION_FAILED);
    EXPECT_NE(o.explanation().find(reason), std::string::npos) << o.explanation();
  }
}

}  // namespace
