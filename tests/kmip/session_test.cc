// Sessions against the scriptable fake KMIP server, relays and proxies:
// the commands end to end, the error numbers of every failure, and trust.
#include <gtest/gtest.h>

#include <chrono>
#include <thread>

#include "platform/kmip/connection.h"
#include "tests/kmip/kmip_test_util.h"
#include "tests/support/kmip_messages.h"
#include "tests/support/loopback_server.h"

namespace {

using namespace KmipTest;
using ZyrdTest::FakeKmipServer;
using ZyrdTest::FakeReply;
using Bytes = std::vector<uint8_t>;
namespace Kmip = ZyrdTest::Kmip;

const Bytes kKey = {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15};

FakeKmipServer::Handler Answer(Bytes bytes) {
  return [=](const Bytes&) { return FakeReply{bytes}; };
}

class FakeServerTest : public ::testing::Test {
 protected:
  // Connects to the fake server with a fresh session.
  void Connect() {
    c_ = std::make_unique<Connection>(Config(server_.port()));
    ASSERT_EQ(c_->number, 0) << c_->explanation;
  }
  template <typename... Args>
  Result Run(const char* command, Args... args) {
    return Perform(c_->session, command, args...);
  }
  // Answers with `handler` and returns the outcome of `command` for "k1".
  std::pair<int, std::string> Fails(FakeKmipServer::Handler handler, const char* command) {
    server_.SetHandler(std::move(handler));
    auto r = Run(command, "k1");
    return {r.number(), r.explanation()};
  }

  FakeKmipServer server_{Kmip::KeyServer("k1", kKey, 2)};
  std::unique_ptr<Connection> c_;
};

TEST_F(FakeServerTest, CommandsAndTheirResponsePaths) {
  Connect();
  auto versions = Run("Query, Versions");
  ASSERT_EQ(versions.number(), 0) << versions.explanation();
  EXPECT_NE(qlc_find("Versions", versions.r), nullptr);
  EXPECT_EQ(versions.Versions(), (std::vector<std::string>{"1.2", "1.1"}));

  auto r = Run("Get, Object, Id=%s", "k1");
  EXPECT_EQ(r.Bytes("Symmetric_Key/Key"), kKey);
  EXPECT_EQ(r.Int("Symmetric_Key/Length"), 128);
  // A failed look-up leaves its reason on the result.
  int bits = 0;
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Key", r.r, "d", &bits), QLC_E_WRONG_TYPE);
  EXPECT_EQ(r.explanation(), "'Symmetric_Key/Key' is not an integer");
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Nope", r.r, "d", &bits), QLC_E_NOT_FOUND);
  EXPECT_EQ(r.explanation(), "no 'Symmetric_Key/Nope' in the response");
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Key", r.r, "x", &bits), QLC_E_BAD_ARGUMENT);

  EXPECT_EQ(Run("Get, Attributes, Id=%s, Names=State", "k1").Int("Attributes/State"), 2);
  EXPECT_EQ(Run("Get, Object, Id=%s, Options={Authentication={User=%s, Password=%s}}", "k1",
                "alice", "pa, ss}")
                .number(),
            0);

  std::vector<Bytes> seen = server_.requests();
  ASSERT_EQ(seen.size(), 4u);
  EXPECT_EQ(Kmip::ReadRequest(seen[1]).operation, Qlc::Operation::kGet);
  EXPECT_FALSE(Kmip::ReadRequest(seen[1]).hasCredential);
  EXPECT_EQ(Kmip::ReadRequest(seen[2]).attributeNames, (std::vector<std::string>{"State"}));
  Kmip::SeenRequest with = Kmip::ReadRequest(seen[3]);
  EXPECT_TRUE(with.hasCredential);
  EXPECT_EQ(with.username + "/" + with.password, "alice/pa, ss}");
  EXPECT_EQ(server_.connections(), 1u);
}

TEST_F(FakeServerTest, ServerFailuresAndMissingValues) {
  Connect();
  auto missing = Run("Get, Object, Id=%s", "nope");
  EXPECT_EQ(missing.number(), QLC_E_OPERATION_FAILED);
  EXPECT_NE(missing.explanation().find(
                "reason 1 (Item Not Found), message 'Could not locate object: nope'"),
            std::string::npos)
      << missing.explanation();

  for (int destroyed : {5, 6}) {
    server_.SetHandler(Answer(Kmip::State("k1", destroyed)));
    EXPECT_EQ(Run("Get, Attributes, Id=%s, Names=State", "k1").Int("Attributes/State"), destroyed);
  }

  server_.SetHandler(Answer(Kmip::Key("k1", {}, /*withMaterial=*/false)));
  auto r = Run("Get, Object, Id=%s", "k1");
  ASSERT_EQ(r.number(), 0);
  unsigned char* bytes = nullptr;
  int length = -1;
  EXPECT_EQ(qlc_value_of("Symmetric_Key/Key", r.r, "bs", &bytes, &length), QLC_E_NOT_FOUND);
  EXPECT_TRUE(bytes == nullptr && length == -1);
}

TEST_F(FakeServerTest, MalformedAnswersKeepTheSessionOnlyWhileFramingHolds) {
  Connect();
  // A well-framed message with an invalid inside: the stream stays in step.
  Bytes bad = Kmip::Versions({{1, 1}});
  bad[bad.size() - 13] = 0x09;  // the last minor version: Integer -> Date-Time
  auto [number, explanation] = Fails(Answer(bad), "Query, Versions");
  EXPECT_EQ(number, QLC_E_MALFORMED_RESPONSE);
  EXPECT_NE(explanation.find("malformed TTLV"), std::string::npos) << explanation;
  EXPECT_EQ(Fails(Kmip::KeyServer("k1", kKey, 2), "Query, Versions").first, 0);
  // The wrong answer for the command.
  EXPECT_EQ(Fails(Answer(Kmip::State("k1", 2)), "Query, Versions").first, QLC_E_MALFORMED_RESPONSE);

  // A header announcing more than the cap: the rest cannot be skipped.
  std::tie(number, explanation) =
      Fails(Answer({0x42, 0x00, 0x7b, 0x01, 0x7f, 0xff, 0xff, 0xf8}), "Query, Versions");
  EXPECT_EQ(number, QLC_E_MALFORMED_RESPONSE);
  EXPECT_NE(explanation.find("exceeds the limit"), std::string::npos) << explanation;
  std::tie(number, explanation) = Fails(Kmip::KeyServer("k1", kKey, 2), "Query, Versions");
  EXPECT_EQ(number, QLC_E_COMMUNICATION);
  EXPECT_NE(explanation.find("broke off"), std::string::npos) << explanation;
}

// Faulty servers: each costs at most the time-out (bounded with a generous
// margin), fails with its own number, and leaves no descriptor open. The fake
// server lives in this process, so descriptors are counted around its life.
TEST(FakeServer, FaultsCostAtMostTheTimeOutAndNoDescriptor) {
  constexpr int kTimeout = 1;
  const Bytes full = Kmip::Key("k1", kKey);
  const Bytes huge = {0x42, 0x00, 0x7b, 0x01, 0x80, 0x00, 0x00, 0x00};  // 2^31 bytes announced
  const size_t half = full.size() / 2, most = full.size() - 1;
  using Mode = FakeKmipServer::Mode;
  const struct {
    const char* what;
    FakeReply reply;
    int number;
    const char* explanation;
    Mode mode = Mode::kTls;
  } cases[] = {
      {"closed before answering", {full, 0, true}, QLC_E_COMMUNICATION, "closed the connection"},
      {"closed in the header", {full, 5, true}, QLC_E_COMMUNICATION, "after 5 of at least 8"},
      {"closed in the body", {full, half, true}, QLC_E_COMMUNICATION, "closed the connection"},
      {"closed a byte short", {full, most, true}, QLC_E_COMMUNICATION, "closed the connection"},
      {"2^31 bytes announced", {huge}, QLC_E_MALFORMED_RESPONSE, "2147483648 exceeds the limit"},
      {"stalled in the body", {full, half}, QLC_E_TIMEOUT, "timed out waiting for the response"},
      {"no answer", {{}, SIZE_MAX, false, true}, QLC_E_TIMEOUT, "timed out waiting for the"},
      {"no handshake", {}, QLC_E_TIMEOUT, "timed out in the TLS handshake", Mode::kNoHandshake},
  };
  {  // whatever OpenSSL opens once per process is open before counting
    FakeKmipServer warm(Kmip::KeyServer("k1", kKey, 2));
    Connection c(Config(warm.port()));
    ASSERT_EQ(Perform(c.session, "Query, Versions").number(), 0);
  }
  for (const auto& t : cases) {
    const size_t before = ZyrdTest::OpenDescriptors();
    {
      FakeKmipServer server([&](const Bytes&) { return t.reply; }, "server", t.mode);
      const auto start = std::chrono::steady_clock::now();
      {
        Connection c(Config(server.port(), {"ca"}, "client", kTimeout));
        int number = c.number;
        std::string explanation = c.explanation;
        if (c.session != nullptr) {
          Result r = Perform(c.session, "Get, Object, Id=%s", "k1");
          number = r.number();
          explanation = r.explanation();
          // The stream is out of step: the session takes no further command.
          EXPECT_EQ(Perform(c.session, "Query, Versions").number(), QLC_E_COMMUNICATION);
        }
        EXPECT_EQ(number, t.number) << t.what << ": " << explanation;
        EXPECT_NE(explanation.find(t.explanation), std::string::npos)
            << t.what << ": " << explanation;
      }
      EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(kTimeout + 5))
          << t.what;
    }
    EXPECT_EQ(ZyrdTest::OpenDescriptors(), before) << t.what;
  }
}

// Trust: which server certificates the Trusted_Cert items admit. An untrusted
// server's own certificate is available from the connect result.
TEST(FakeServer, TrustComesOnlyFromTheTrustedCertificates) {
  const struct {
    const char* served;
    std::vector<std::string> trusted;
    bool ok;
  } cases[] = {
      {"server", {"ca"}, true},
      {"server", {"server"}, true},          // the leaf itself
      {"server", {"other_ca", "ca"}, true},  // any of several
      {"server", {}, false},
      {"other_server", {"ca"}, false},
      {"wronghost", {"ca"}, false},        // CA trust needs the host
      {"wronghost", {"wronghost"}, true},  // a pinned leaf does not
      {"selfsigned", {"selfsigned"}, true},
      {"selfsigned", {"ca"}, false},
  };
  for (const auto& t : cases) {
    FakeKmipServer server(Kmip::KeyServer("k", kKey, 2), t.served);
    Connection c(Config(server.port(), t.trusted));
    EXPECT_EQ(c.number, t.ok ? 0 : QLC_E_UNTRUSTED_SERVER) << t.served << ": " << c.explanation;
    EXPECT_EQ(c.fetch, t.ok ? QLC_E_NO_SERVER_CREDENTIALS : 0);
    if (!t.ok) {
      EXPECT_EQ(c.format, QLC_CERT_FORMAT_PEM);
      EXPECT_EQ(c.serverCert, PkiPem(t.served)) << t.served;
    }
  }
}

TEST(FakeServer, HostNamesIpv6AndProxies) {
  FakeKmipServer v4(Kmip::KeyServer("k", kKey, 2));
  EXPECT_EQ(Connection(Config(v4.port(), {"ca"}, "client", 5, "localhost")).number, 0);
  FakeKmipServer v6(Kmip::KeyServer("k", kKey, 2), "server", FakeKmipServer::Mode::kTls, true);
  Connection byV6(Config(v6.port(), {"ca"}, "client", 5, "::1"));
  ASSERT_EQ(byV6.number, 0) << byV6.explanation;
  EXPECT_EQ(Perform(byV6.session, "Query, Versions").number(), 0);

  ZyrdTest::TcpRelay proxy(ZyrdTest::TcpRelay::Mode::kProxy);
  Qlc::SessionConfig config = Config(v4.port());
  config.proxy = Qlc::Endpoint{"127.0.0.1", proxy.port()};
  {
    Connection c(config);
    ASSERT_EQ(c.number, 0) << c.explanation;
    EXPECT_EQ(Perform(c.session, "Query, Versions").number(), 0);
  }
  EXPECT_EQ(proxy.connectTargets(),
            (std::vector<std::string>{"127.0.0.1:" + std::to_string(v4.port())}));

  ZyrdTest::TcpRelay refusing(ZyrdTest::TcpRelay::Mode::kRefusingProxy);
  config.proxy = Qlc::Endpoint{"127.0.0.1", refusing.port()};
  Connection c(config);
  EXPECT_EQ(c.number, QLC_E_COMMUNICATION);
  EXPECT_NE(c.explanation.find("proxy refused the tunnel"), std::string::npos) << c.explanation;
  EXPECT_NE(c.explanation.find("403"), std::string::npos) << c.explanation;
  EXPECT_EQ(v4.connections(), 2u);
}

TEST(Connect, LocalProblemsHaveTheirOwnNumbers) {
  const uint16_t closed = ZyrdTest::ClosedPort();
  Connection refused(Config(closed));
  EXPECT_EQ(refused.number, QLC_E_COMMUNICATION);
  EXPECT_NE(refused.explanation.find("Connection refused"), std::string::npos);

  auto withKey = [&](const std::string& key) {
    Qlc::SessionConfig c = Config(closed);
    c.clientPrivateKey.assign(key);
    return std::make_unique<Connection>(c);
  };
  EXPECT_EQ(withKey("not a key")->number, QLC_E_BAD_CERTIFICATE);
  auto mismatch = withKey(PkiKey("client2"));
  EXPECT_EQ(mismatch->number, QLC_E_BAD_CERTIFICATE);
  EXPECT_NE(mismatch->explanation.find("does not fit"), std::string::npos);
  Qlc::SessionConfig badTrust = Config(closed);
  badTrust.trustedCertificates.push_back("garbage");
  Connection untrustable(badTrust);
  EXPECT_EQ(untrustable.number, QLC_E_BAD_CERTIFICATE);
  EXPECT_NE(untrustable.explanation.find("trusted certificate 2"), std::string::npos);

  qlc_session* session = reinterpret_cast<qlc_session*>(1);
  Result r(qlc_connect_key_manager(&session, "Presentation={}"));
  EXPECT_EQ(r.number(), QLC_E_BAD_DESCRIPTION);
  EXPECT_NE(r.explanation().find("invalid session description"), std::string::npos);
  EXPECT_EQ(session, nullptr);
  int v;  // a failed result has no response to look into
  EXPECT_EQ(qlc_value_of("Versions", r.r, "d", &v), QLC_E_BAD_ARGUMENT);
}

// A name lookup that hangs costs the session's time-out, not the
// resolver's: the connect gives up at the deadline and the lookup is left
// to finish on its own.
TEST(Connect, AHungLookupIsBoundedByTheTimeOut) {
  Qlc::SetLookupFunction([](const char*, const char*, const addrinfo*, addrinfo**) {
    std::this_thread::sleep_for(std::chrono::seconds(10));
    return EAI_AGAIN;
  });
  const auto start = std::chrono::steady_clock::now();
  Connection slow(Config(ZyrdTest::ClosedPort(), {"ca"}, "client", 1, "kms.example"));
  const auto waited = std::chrono::steady_clock::now() - start;
  Qlc::SetLookupFunction(nullptr);
  EXPECT_EQ(slow.number, QLC_E_TIMEOUT);
  EXPECT_NE(slow.explanation.find("timed out resolving 'kms.example'"), std::string::npos);
  EXPECT_LT(waited, std::chrono::seconds(6));
  // Numeric addresses never wait for a lookup.
  Connection numeric(Config(ZyrdTest::ClosedPort(), {"ca"}, "client", 1, "::1"));
  EXPECT_EQ(numeric.number, QLC_E_COMMUNICATION);
}

TEST(CSurface, NullAndForeignHandlesAreRefused) {
  EXPECT_EQ(qlc_ok(nullptr), QLC_E_RESOURCES);
  EXPECT_NE(qlc_explain(nullptr), nullptr);
  qlc_release(nullptr);
  qlc_disconnect_key_manager(nullptr);
  qlc_free(nullptr);
  qlc_free_credentials(nullptr);
  EXPECT_EQ(Perform(nullptr, "Query, Versions").number(), QLC_E_BAD_ARGUMENT);
  EXPECT_EQ(qlc_find("Versions", nullptr), nullptr);
  EXPECT_EQ(qlc_next(nullptr), nullptr);
  int v;
  EXPECT_EQ(qlc_value_of("x", nullptr, "d", &v), QLC_E_BAD_ARGUMENT);
  qlc_server_credentials* cred = reinterpret_cast<qlc_server_credentials*>(1);
  EXPECT_EQ(qlc_fetch_server_credentials(nullptr, &cred), QLC_E_BAD_ARGUMENT);
  EXPECT_EQ(cred, nullptr);
}

}  // namespace
