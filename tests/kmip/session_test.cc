// Sessions against the scriptable fake KMIP server, relays and proxies:
// the commands end to end, the error numbers of every failure, and trust.
#include <gtest/gtest.h>

#include <chrono>
#include <cstdio>

#include "tests/kmip/kmip_test_util.h"
#include "tests/support/kmip_messages.h"
#include "tests/support/loopback_server.h"

namespace {

using KmipTest::Config;
using KmipTest::Connection;
using KmipTest::Pki;
using KmipTest::Take;
using ZyrdTest::FakeKmipServer;
using ZyrdTest::FakeReply;
using Bytes = std::vector<uint8_t>;
namespace Kmip = ZyrdTest::Kmip;

const Bytes kKey = {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15};

FakeKmipServer::Handler Answer(Bytes bytes, bool close = false, size_t only = SIZE_MAX) {
  return [=](const Bytes&) { return FakeReply{bytes, only, close, false}; };
}

class FakeServerTest : public ::testing::Test {
 protected:
  FakeServerTest()
      : server_(Pki().Pem("server"), Pki().Key("server"), Kmip::KeyServer("k1", kKey, 2)) {}
  Qlc::SessionConfig Trusting(int timeout = 5) {
    return Config("127.0.0.1", server_.port(), {"ca"}, "client", timeout);
  }
  FakeKmipServer server_;
};

TEST_F(FakeServerTest, VersionsKeyAndStateThroughTheResponsePaths) {
  Connection c(Trusting());
  ASSERT_EQ(c.number, 0) << c.explanation;

  qlc_result* r = qlc_perform(c.session, "Query, Versions");
  ASSERT_EQ(qlc_ok(r), 0) << qlc_explain(r);
  EXPECT_NE(qlc_find("Versions", r), nullptr);
  std::vector<std::string> versions = KmipTest::VersionTexts(r);
  EXPECT_EQ(versions, (std::vector<std::string>{"1.2", "1.1"}));
  qlc_release(r);

  r = qlc_perform(c.session, "Get, Object, Id=%s", "k1");
  ASSERT_EQ(qlc_ok(r), 0) << qlc_explain(r);
  unsigned char* bytes = nullptr;
  int length = 0;
  ASSERT_EQ(qlc_value_of("Symmetric_Key/Key", r, "bs", &bytes, &length), 0);
  EXPECT_EQ(Bytes(bytes, bytes + length), kKey);
  qlc_free(bytes);
  int bits = 0;
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Length", r, "d", &bits), 0);
  EXPECT_EQ(bits, 128);
  // A byte string is no integer; the reason lands on the result.
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Key", r, "d", &bits), QLC_E_WRONG_TYPE);
  EXPECT_STREQ(qlc_explain(r), "'Symmetric_Key/Key' is not an integer");
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Nope", r, "bs", &bytes, &length), QLC_E_NOT_FOUND);
  EXPECT_STREQ(qlc_explain(r), "no 'Symmetric_Key/Nope' in the response");
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Key", r, "x", &bits), QLC_E_BAD_ARGUMENT);
  qlc_release(r);

  r = qlc_perform(c.session, "Get, Attributes, Id=%s, Names=State", "k1");
  int state = 0;
  ASSERT_EQ(qlc_value_of("Attributes/State", r, "d", &state), 0) << qlc_explain(r);
  EXPECT_EQ(state, 2);
  qlc_release(r);

  std::vector<Bytes> seen = server_.requests();
  ASSERT_EQ(seen.size(), 3u);
  EXPECT_EQ(Kmip::ReadRequest(seen[1]).operation, Qlc::Operation::kGet);
  EXPECT_EQ(Kmip::ReadRequest(seen[2]).attributeNames, (std::vector<std::string>{"State"}));
  EXPECT_EQ(server_.connections(), 1u);
}

TEST_F(FakeServerTest, CredentialOptionsGoIntoTheRequestHeader) {
  Connection c(Trusting());
  ASSERT_EQ(c.number, 0) << c.explanation;
  auto o = Take(qlc_perform(c.session,
                            "Get, Object, Id=%s, Options={Authentication={User=%s, Password=%s}}",
                            "k1", "alice", "pa, ss}"));
  EXPECT_EQ(o.number, 0) << o.explanation;
  EXPECT_EQ(Take(qlc_perform(c.session, "Get, Object, Id=%s", "k1")).number, 0);
  std::vector<Bytes> seen = server_.requests();
  ASSERT_EQ(seen.size(), 2u);
  Kmip::SeenRequest with = Kmip::ReadRequest(seen[0]);
  EXPECT_TRUE(with.hasCredential);
  EXPECT_EQ(with.username, "alice");
  EXPECT_EQ(with.password, "pa, ss}");
  EXPECT_FALSE(Kmip::ReadRequest(seen[1]).hasCredential);
}

TEST_F(FakeServerTest, ServerFailuresAndMissingValues) {
  Connection c(Trusting());
  ASSERT_EQ(c.number, 0) << c.explanation;
  auto missing = Take(qlc_perform(c.session, "Get, Object, Id=%s", "nope"));
  EXPECT_EQ(missing.number, QLC_E_OPERATION_FAILED);
  EXPECT_NE(missing.explanation.find("reason 1 (Item Not Found), message 'Could not locate "
                                     "object: nope'"),
            std::string::npos)
      << missing.explanation;

  for (int destroyed : {5, 6}) {
    server_.SetHandler(Answer(Kmip::State("k1", destroyed)));
    qlc_result* r = qlc_perform(c.session, "Get, Attributes, Id=%s, Names=State", "k1");
    int state = 0;
    EXPECT_EQ(qlc_value_of("Attributes/State", r, "d", &state), 0);
    EXPECT_EQ(state, destroyed);
    qlc_release(r);
  }

  server_.SetHandler(Answer(Kmip::KeyWithoutMaterial("k1")));
  qlc_result* r = qlc_perform(c.session, "Get, Object, Id=%s", "k1");
  ASSERT_EQ(qlc_ok(r), 0);
  unsigned char* bytes = nullptr;
  int length = -1;
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Key", r, "bs", &bytes, &length), QLC_E_NOT_FOUND);
  EXPECT_EQ(bytes, nullptr);
  EXPECT_EQ(length, -1);
  EXPECT_STREQ(qlc_explain(r), "no 'Symmetric_Key/Key' in the response");
  qlc_release(r);

  server_.SetHandler(Answer(Kmip::Versions({})));
  r = qlc_perform(c.session, "Query, Versions");
  EXPECT_EQ(qlc_ok(r), 0);
  EXPECT_EQ(qlc_find("Versions", r), nullptr);
  EXPECT_EQ(qlc_find("Versions/", r), nullptr);
  qlc_release(r);
}

TEST_F(FakeServerTest, MalformedAnswersKeepTheSessionOnlyWhileFramingHolds) {
  Connection c(Trusting());
  ASSERT_EQ(c.number, 0) << c.explanation;
  // A well-framed message with an invalid inside: the stream stays in step.
  Bytes bad = Kmip::Versions({{1, 1}});
  bad[bad.size() - 13] = 0x09;  // the last minor version: Integer -> Date-Time
  server_.SetHandler(Answer(bad));
  auto o = Take(qlc_perform(c.session, "Query, Versions"));
  EXPECT_EQ(o.number, QLC_E_MALFORMED_RESPONSE);
  EXPECT_NE(o.explanation.find("malformed TTLV"), std::string::npos) << o.explanation;
  server_.SetHandler(Kmip::KeyServer("k1", kKey, 2));
  EXPECT_EQ(Take(qlc_perform(c.session, "Query, Versions")).number, 0);

  // The wrong answer for the command.
  server_.SetHandler(Answer(Kmip::State("k1", 2)));
  o = Take(qlc_perform(c.session, "Query, Versions"));
  EXPECT_EQ(o.number, QLC_E_MALFORMED_RESPONSE);

  // A header announcing more than the cap: the rest cannot be skipped.
  Bytes huge = {0x42, 0x00, 0x7b, 0x01, 0x7f, 0xff, 0xff, 0xf8};
  server_.SetHandler(Answer(huge));
  o = Take(qlc_perform(c.session, "Query, Versions"));
  EXPECT_EQ(o.number, QLC_E_MALFORMED_RESPONSE);
  EXPECT_NE(o.explanation.find("exceeds the limit"), std::string::npos) << o.explanation;
  server_.SetHandler(Kmip::KeyServer("k1", kKey, 2));
  o = Take(qlc_perform(c.session, "Query, Versions"));
  EXPECT_EQ(o.number, QLC_E_COMMUNICATION);
  EXPECT_NE(o.explanation.find("broke off"), std::string::npos) << o.explanation;
}

TEST_F(FakeServerTest, ClosedMidResponseIsACommunicationFailure) {
  Bytes full = Kmip::Key("k1", kKey);
  for (size_t cut : {size_t{0}, size_t{5}, full.size() / 2, full.size() - 1}) {
    server_.SetHandler(Answer(full, /*close=*/true, cut));
    Connection c(Trusting());
    ASSERT_EQ(c.number, 0) << c.explanation;
    auto o = Take(qlc_perform(c.session, "Get, Object, Id=%s", "k1"));
    EXPECT_EQ(o.number, QLC_E_COMMUNICATION) << "cut at " << cut << ": " << o.explanation;
    EXPECT_NE(o.explanation.find("closed the connection"), std::string::npos) << o.explanation;
  }
}

TEST_F(FakeServerTest, SilenceIsATimeoutAndBreaksTheSession) {
  server_.SetHandler([](const Bytes&) { return FakeReply{{}, SIZE_MAX, false, true}; });
  Connection c(Trusting(/*timeout=*/1));
  ASSERT_EQ(c.number, 0) << c.explanation;
  auto start = std::chrono::steady_clock::now();
  auto o = Take(qlc_perform(c.session, "Query, Versions"));
  double took = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
  std::printf("no answer: error %d after %.2f s with a 1 s time-out\n", o.number, took);
  EXPECT_EQ(o.number, QLC_E_TIMEOUT) << o.explanation;
  EXPECT_NE(o.explanation.find("timed out waiting for the response"), std::string::npos);
  EXPECT_EQ(Take(qlc_perform(c.session, "Query, Versions")).number, QLC_E_COMMUNICATION);
}

TEST(FakeServer, NoHandshakeIsATimeoutAtConnect) {
  FakeKmipServer mute(Pki().Pem("server"), Pki().Key("server"), nullptr,
                      FakeKmipServer::Mode::kNoHandshake);
  auto start = std::chrono::steady_clock::now();
  Connection c(Config("127.0.0.1", mute.port(), {"ca"}, "client", 1));
  double took = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
  std::printf("no handshake: error %d after %.2f s with a 1 s time-out\n", c.number, took);
  EXPECT_EQ(c.number, QLC_E_TIMEOUT);
  EXPECT_NE(c.explanation.find("timed out in the TLS handshake"), std::string::npos)
      << c.explanation;
  EXPECT_EQ(c.session, nullptr);
}

// Trust: which server certificates the Trusted_Cert items admit.
struct TrustCase {
  const char* served;
  std::vector<std::string> trusted;
  int expected;
};

TEST(FakeServer, TrustComesOnlyFromTheTrustedCertificates) {
  const TrustCase cases[] = {
      {"server", {"ca"}, 0},
      {"server", {"server"}, 0},          // the leaf itself
      {"server", {"other_ca", "ca"}, 0},  // any of several
      {"server", {}, QLC_E_UNTRUSTED_SERVER},
      {"other_server", {"ca"}, QLC_E_UNTRUSTED_SERVER},
      {"wronghost", {"ca"}, QLC_E_UNTRUSTED_SERVER},  // CA trust needs the host
      {"wronghost", {"wronghost"}, 0},                // a pinned leaf does not
      {"selfsigned", {"selfsigned"}, 0},
      {"selfsigned", {"ca"}, QLC_E_UNTRUSTED_SERVER},
  };
  for (const TrustCase& t : cases) {
    FakeKmipServer server(Pki().Pem(t.served), Pki().Key(t.served), Kmip::KeyServer("k", kKey, 2));
    Connection c(Config("127.0.0.1", server.port(), t.trusted));
    EXPECT_EQ(c.number, t.expected) << t.served << ": " << c.explanation;
    if (t.expected == QLC_E_UNTRUSTED_SERVER) {
      EXPECT_EQ(c.fetch, 0);
      EXPECT_EQ(c.format, QLC_CERT_FORMAT_PEM);
      EXPECT_EQ(c.serverCert, Pki().Pem(t.served)) << t.served;
    } else {
      EXPECT_EQ(c.fetch, QLC_E_NO_SERVER_CREDENTIALS);
    }
  }
}

TEST(FakeServer, HostNamesAndIpv6) {
  FakeKmipServer v4(Pki().Pem("server"), Pki().Key("server"), Kmip::KeyServer("k", kKey, 2));
  Connection by_name(Config("localhost", v4.port(), {"ca"}));
  EXPECT_EQ(by_name.number, 0) << by_name.explanation;

  FakeKmipServer v6(Pki().Pem("server"), Pki().Key("server"), Kmip::KeyServer("k", kKey, 2),
                    FakeKmipServer::Mode::kTls, /*ipv6=*/true);
  Connection by_v6(Config("::1", v6.port(), {"ca"}));
  EXPECT_EQ(by_v6.number, 0) << by_v6.explanation;
  EXPECT_EQ(Take(qlc_perform(by_v6.session, "Query, Versions")).number, 0);
}

TEST(FakeServer, ProxyForwardsOrRefuses) {
  FakeKmipServer server(Pki().Pem("server"), Pki().Key("server"), Kmip::KeyServer("k", kKey, 2));
  ZyrdTest::TcpRelay proxy(ZyrdTest::TcpRelay::Mode::kProxy);
  Qlc::SessionConfig config = Config("127.0.0.1", server.port(), {"ca"});
  config.proxy = Qlc::Endpoint{"127.0.0.1", proxy.port()};
  {
    Connection c(config);
    ASSERT_EQ(c.number, 0) << c.explanation;
    EXPECT_EQ(Take(qlc_perform(c.session, "Query, Versions")).number, 0);
  }
  EXPECT_EQ(proxy.connectTargets(),
            (std::vector<std::string>{"127.0.0.1:" + std::to_string(server.port())}));

  ZyrdTest::TcpRelay refusing(ZyrdTest::TcpRelay::Mode::kRefusingProxy);
  config.proxy = Qlc::Endpoint{"127.0.0.1", refusing.port()};
  Connection c(config);
  EXPECT_EQ(c.number, QLC_E_COMMUNICATION);
  EXPECT_NE(c.explanation.find("proxy refused the tunnel"), std::string::npos) << c.explanation;
  EXPECT_NE(c.explanation.find("403"), std::string::npos) << c.explanation;
  EXPECT_EQ(server.connections(), 1u);
}

TEST(FakeServer, RelayCountsConnections) {
  FakeKmipServer server(Pki().Pem("server"), Pki().Key("server"), Kmip::KeyServer("k", kKey, 2));
  ZyrdTest::TcpRelay relay(ZyrdTest::TcpRelay::Mode::kForward, server.port());
  EXPECT_EQ(relay.connections(), 0u);
  for (int i = 0; i < 2; ++i) {
    Connection c(Config("127.0.0.1", relay.port(), {"ca"}));
    ASSERT_EQ(c.number, 0) << c.explanation;
    EXPECT_EQ(Take(qlc_perform(c.session, "Query, Versions")).number, 0);
  }
  EXPECT_EQ(relay.connections(), 2u);
}

TEST(Connect, LocalProblemsHaveTheirOwnNumbers) {
  uint16_t closed = ZyrdTest::FreeLoopbackPort();
  Connection refused(Config("127.0.0.1", closed, {"ca"}));
  EXPECT_EQ(refused.number, QLC_E_COMMUNICATION);
  EXPECT_NE(refused.explanation.find("Connection refused"), std::string::npos);

  Qlc::SessionConfig no_key = Config("127.0.0.1", closed, {"ca"});
  no_key.clientPrivateKey.assign("not a key");
  EXPECT_EQ(Connection(no_key).number, QLC_E_BAD_CERTIFICATE);
  Qlc::SessionConfig other_key = Config("127.0.0.1", closed, {"ca"});
  other_key.clientPrivateKey.assign(Pki().Key("client2"));
  Connection mismatch(other_key);
  EXPECT_EQ(mismatch.number, QLC_E_BAD_CERTIFICATE);
  EXPECT_NE(mismatch.explanation.find("does not fit"), std::string::npos);
  Qlc::SessionConfig bad_trust = Config("127.0.0.1", closed, {"ca"});
  bad_trust.trustedCertificates.push_back("garbage");
  Connection untrustable(bad_trust);
  EXPECT_EQ(untrustable.number, QLC_E_BAD_CERTIFICATE);
  EXPECT_NE(untrustable.explanation.find("trusted certificate 2"), std::string::npos);

  qlc_session* session = reinterpret_cast<qlc_session*>(1);
  qlc_result* r = qlc_connect_key_manager(&session, "Presentation={}");
  EXPECT_EQ(qlc_ok(r), QLC_E_BAD_DESCRIPTION);
  EXPECT_NE(std::string(qlc_explain(r)).find("invalid session description"), std::string::npos);
  EXPECT_EQ(session, nullptr);
  qlc_release(r);
}

TEST(CSurface, NullAndForeignHandlesAreRefused) {
  EXPECT_EQ(qlc_ok(nullptr), QLC_E_RESOURCES);
  EXPECT_NE(qlc_explain(nullptr), nullptr);
  qlc_release(nullptr);
  qlc_disconnect_key_manager(nullptr);
  qlc_free(nullptr);
  qlc_free_credentials(nullptr);
  EXPECT_EQ(KmipTest::Take(qlc_perform(nullptr, "Query, Versions")).number, QLC_E_BAD_ARGUMENT);
  EXPECT_EQ(qlc_find("Versions", nullptr), nullptr);
  EXPECT_EQ(qlc_next(nullptr), nullptr);
  int v;
  EXPECT_EQ(qlc_value_of("x", nullptr, "d", &v), QLC_E_BAD_ARGUMENT);
  qlc_server_credentials* cred = reinterpret_cast<qlc_server_credentials*>(1);
  EXPECT_EQ(qlc_fetch_server_credentials(nullptr, &cred), QLC_E_BAD_ARGUMENT);
  EXPECT_EQ(cred, nullptr);
  // A failed result has no response to look into.
  qlc_session* s = nullptr;
  qlc_result* r = qlc_connect_key_manager(&s, "");
  EXPECT_EQ(qlc_value_of("Versions", r, "d", &v), QLC_E_BAD_ARGUMENT);
  qlc_release(r);
}

}  // namespace
