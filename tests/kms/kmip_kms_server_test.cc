// The key server client against a real KMIP server (PyKMIP, with the keys
// its harness made), and against the fake server for faults a real server
// does not produce.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "kms/kmip_kms.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/base64.h"
#include "tests/support/kmip_env.h"
#include "tests/support/kmip_messages.h"
#include "tests/support/log_capture.h"
#include "tests/support/loopback_server.h"

namespace {

using namespace Zyrd::Kms;
using ZyrdTest::FakeKmipServer;
using ZyrdTest::KmipPort;
using ZyrdTest::PkiPem;
using ZyrdTest::TcpRelay;
using ZyrdTest::TestKey;
namespace Kmip = ZyrdTest::Kmip;

// A provider "p1" whose servers s1, s2... are on `ports` of the loopback
// address.
std::shared_ptr<KmsInfo> Provider(const std::string& masterKey, std::vector<uint16_t> ports,
                                  const std::string& trusted = "ca",
                                  const std::string& client = "client") {
  auto info = std::make_shared<KmsInfo>();
  info->name = "p1";
  info->masterKeyId = masterKey;
  info->connectionTimeout = 5;
  info->clientCertificate = PkiPem(client);
  info->clientPrivateKey.assign(ZyrdTest::PkiKey(client));
  if (!trusted.empty()) info->trustedServerCertificates = {PkiPem(trusted)};
  for (size_t i = 0; i < ports.size(); ++i) {
    info->servers.push_back({"s" + std::to_string(i + 1), "127.0.0.1", ports[i]});
  }
  return info;
}
std::shared_ptr<KmsInfo> OnPyKmip(const std::string& key, const std::string& trusted = "ca",
                                  const std::string& client = "client") {
  return Provider(TestKey(key).id, {KmipPort()}, trusted, client);
}

// The outcome of one key operation.
struct Op {
  KmsResult result = Ok;
  Groundwork::SecureString key;
  std::string wrapped, reason;
};
template <typename Client>
Op Generate(Client&& client, uint32_t size = 32) {
  Op o;
  o.result = client.GenerateKey(0, size, o.key, o.wrapped, o.reason);
  return o;
}
template <typename Client>
Op Decrypt(Client&& client, const std::string& wrapped) {
  Op o;
  o.result = client.Decrypt(0, wrapped, o.key, o.reason);
  return o;
}

// A fake server holding the bytes of a test key as an active key.
FakeKmipServer::Handler ActiveTwin(const std::string& name) {
  return Kmip::KeyServer(TestKey(name).id, TestKey(name).bytes, 2);
}

class KmipKmsServerTest : public ::testing::Test {
 protected:
  ZyrdTest::LogCapture log_;
};

TEST_F(KmipKmsServerTest, GenerateThenDecryptRoundTripsUnderBothKeySizes) {
  for (const char* name : {"aes128", "aes256"}) {
    KmipKms client(OnPyKmip(name));
    for (uint32_t size : {1u, 16u, 32u, 64u, 1000u}) {
      Op made = Generate(client, size);
      ASSERT_EQ(made.result, Ok) << made.reason;
      std::vector<uint8_t> bytes;
      EXPECT_TRUE(Base64_Decode(made.key.view(), &bytes));
      EXPECT_EQ(bytes.size(), size);
      Op back = Decrypt(client, made.wrapped);
      ASSERT_EQ(back.result, Ok) << back.reason;
      EXPECT_EQ(back.key, made.key);
    }
  }

  // A key wrapped on one server unwraps through another holding the same key.
  FakeKmipServer twin(ActiveTwin("aes256"));
  Op made = Generate(KmipKms(OnPyKmip("aes256")));
  Op back = Decrypt(KmipKms(Provider(TestKey("aes256").id, {twin.port()})), made.wrapped);
  ASSERT_EQ(back.result, Ok) << back.reason;
  EXPECT_EQ(back.key, made.key);
}

// Data keys are wrapped under each master key by a fake server that holds
// its bytes as active; the real server then judges them by their state.
TEST_F(KmipKmsServerTest, KeyStatesDecideWhatEachOperationMayDo) {
  Op preActive = Generate(KmipKms(OnPyKmip("preactive")));
  EXPECT_EQ(preActive.result, MasterKeyPreActive);
  EXPECT_EQ(preActive.reason, "The Key is in pre-active state and needs to be activated");

  for (const std::string name : {"deactivated", "compromised"}) {
    const std::string id = TestKey(name).id;
    log_.Clear();
    KmipKms client(OnPyKmip(name));
    EXPECT_EQ(Generate(client).result, MasterKeyUnusableForEncryption);
    EXPECT_EQ(log_.Count("Failed to generate key. Could not fetch master key or it is not usable. "
                         "Key " +
                         id +
                         ", provider p1, server s1, reason The key is in "
                         "deactivated or compromised state"),
              1u);
    FakeKmipServer twin(ActiveTwin(name));
    Op made = Generate(KmipKms(Provider(id, {twin.port()})));
    Op back = Decrypt(client, made.wrapped);
    ASSERT_EQ(back.result, Ok) << back.reason;
    EXPECT_EQ(back.key, made.key);
    EXPECT_EQ(log_.Count("Proceeding to decrpt with a key which is deactivated or compromised. "
                         "Key " +
                         id + ", provider p1, server s1"),
              1u);
  }

  // A destroyed key is gone from the real server: not found.
  FakeKmipServer twin(ActiveTwin("destroyed"));
  Op made = Generate(KmipKms(Provider(TestKey("destroyed").id, {twin.port()})));
  EXPECT_EQ(Decrypt(KmipKms(OnPyKmip("destroyed")), made.wrapped).result, MasterKeyNotFound);
  // The destroyed states themselves only a fake server reports.
  for (int state : {5, 6}) {
    FakeKmipServer fake(Kmip::KeyServer("mk", std::vector<uint8_t>(32, 7), state));
    Op o = Generate(KmipKms(Provider("mk", {fake.port()})));
    EXPECT_EQ(o.result, MasterKeyUnusable) << state;
    EXPECT_EQ(o.reason, "The key is in destroyed or destroyed compromised state");
  }
}

// A faulty server costs a key operation at most the connection time-out
// (bounded with a generous margin) and no descriptor; a broken or stalled
// stream is a communication failure or a time-out, not a missing key, and an
// oversized message is a library failure (reported as a missing key).
TEST_F(KmipKmsServerTest, FaultyServersCostAtMostTheTimeOutAndNoDescriptor) {
  constexpr int kTimeout = 1;
  const std::vector<uint8_t> full = Kmip::Key("mk", std::vector<uint8_t>(32, 7));
  const std::vector<uint8_t> huge = {0x42, 0x00, 0x7b, 0x01, 0x80, 0x00, 0x00, 0x00};  // 2^31
  const struct {
    const char* what;
    ZyrdTest::FakeReply reply;
    KmsResult result;
    FakeKmipServer::Mode mode = FakeKmipServer::Mode::kTls;
  } cases[] = {
      {"closed in the header", {full, 5, true}, KeyServerCommunicationError},
      {"closed in the body", {full, full.size() / 2, true}, KeyServerCommunicationError},
      {"2^31 bytes announced", {huge}, MasterKeyNotFound},
      {"stalled after the handshake", {{}, SIZE_MAX, false, true}, KeyServerTimeout},
      {"no handshake", {}, KeyServerTimeout, FakeKmipServer::Mode::kNoHandshake},
  };
  {  // whatever OpenSSL opens once per process is open before counting
    FakeKmipServer warm(Kmip::KeyServer("mk", std::vector<uint8_t>(32, 7), 2));
    ASSERT_EQ(Generate(KmipKms(Provider("mk", {warm.port()}))).result, Ok);
  }
  for (const auto& t : cases) {
    const size_t before = ZyrdTest::OpenDescriptors();
    {
      FakeKmipServer server([&](const std::vector<uint8_t>&) { return t.reply; }, "server", t.mode);
      auto info = Provider("mk", {server.port()});
      info->connectionTimeout = kTimeout;
      const auto start = std::chrono::steady_clock::now();
      Op o = Generate(KmipKms(info));
      EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(kTimeout + 5))
          << t.what;
      EXPECT_EQ(o.result, t.result) << t.what << ": " << o.reason;
    }
    EXPECT_EQ(ZyrdTest::OpenDescriptors(), before) << t.what;
  }
}

TEST_F(KmipKmsServerTest, FaultsMapToTheirResults) {
  // An answer without key material, and a malformed answer, are library
  // failures that surface as a missing master key.
  FakeKmipServer noKey([](const std::vector<uint8_t>& request) {
    return ZyrdTest::FakeReply{Kmip::Key(Kmip::ReadRequest(request).id, {}, false)};
  });
  KmipKms client(Provider("mk", {noKey.port()}));
  Op o = Generate(client);
  EXPECT_EQ(o.result, MasterKeyNotFound);
  EXPECT_FALSE(o.reason.empty());
  // The failed read was not kept; the good one is, until a status refresh.
  noKey.SetHandler(Kmip::KeyServer("mk", std::vector<uint8_t>(32, 7), 2));
  EXPECT_EQ(Generate(client).result, Ok);
  const size_t requests = noKey.requests().size();
  EXPECT_EQ(Generate(client).result, Ok);
  EXPECT_EQ(noKey.requests().size(), requests);
  // Complete framing around an item of an unknown type.
  FakeKmipServer garbage([](const std::vector<uint8_t>&) {
    return ZyrdTest::FakeReply{
        {0x42, 0x00, 0x7b, 0x01, 0x00, 0x00, 0x00, 0x08, 0x42, 0x00, 0x7c, 0xff, 0, 0, 0, 0}};
  });
  EXPECT_EQ(Generate(KmipKms(Provider("mk", {garbage.port()}))).result, MasterKeyNotFound);

  const uint16_t closed = ZyrdTest::ClosedPort();
  EXPECT_EQ(Generate(KmipKms(Provider("mk", {closed}))).result, KeyServerCommunicationError);

  // A text that is not a wrapped key fails before any server is asked (the
  // closed port would answer otherwise).
  o = Decrypt(KmipKms(Provider("mk", {closed})), "zyrwk.v1.nope");
  EXPECT_EQ(o.result, MetadataFailure);
  EXPECT_EQ(o.reason, "Failed to read metadata");
}

TEST_F(KmipKmsServerTest, ProbeReportsTrustInBothDirectionsAndTheMasterKey) {
  KmsStatus status;
  KmipKms(OnPyKmip("aes256")).GetStatus(status);
  ASSERT_EQ(status.servers.size(), 1u);
  EXPECT_TRUE(status.servers[0].clientTrustServer && status.servers[0].serverTrustClient);
  EXPECT_TRUE(status.servers[0].errors.empty());
  EXPECT_TRUE(status.masterKeyFound && status.masterKeyUsable && status.keySizeSupported);
  EXPECT_TRUE(status.masterKeyErrors.empty());

  // The client trusts another CA; the server accepts the client.
  KmipKms(OnPyKmip("aes256", "other_ca")).GetStatus(status);
  EXPECT_FALSE(status.servers[0].clientTrustServer);
  EXPECT_TRUE(status.servers[0].serverTrustClient);
  EXPECT_EQ(status.servers[0].errors.count(
                "com.tarsel.orna.kms.providers.statussvc.client_not_trusting_server"),
            1u);
  EXPECT_FALSE(status.masterKeyFound);
  EXPECT_EQ(status.masterKeyErrors, std::vector<KmsResult>{MasterKeyNotFound});

  // Neither side trusts the other.
  KmipKms(OnPyKmip("aes256", "other_ca", "other_client")).GetStatus(status);
  EXPECT_FALSE(status.servers[0].clientTrustServer || status.servers[0].serverTrustClient);
  EXPECT_EQ(status.servers[0].errors.size(), 2u);

  // A master key of 192 bits is found and usable but of unsupported size.
  FakeKmipServer odd(Kmip::KeyServer("odd", std::vector<uint8_t>(24, 1), 2));
  KmipKms(Provider("odd", {odd.port()})).GetStatus(status);
  EXPECT_TRUE(status.masterKeyFound && status.masterKeyUsable && !status.keySizeSupported);
  EXPECT_EQ(status.masterKeyErrors, std::vector<KmsResult>{MasterKeyLengthUnsupported});
}

TEST_F(KmipKmsServerTest, CachedStatusServesKeyOperationsWithoutAnyConnection) {
  TcpRelay relay(TcpRelay::Mode::kForward, KmipPort());
  KmipKms client(Provider(TestKey("aes256").id, {relay.port()}));
  client.UpdateStatus();
  const size_t afterProbe = relay.connections();
  EXPECT_GT(afterProbe, 0u);

  Op made = Generate(client);
  ASSERT_EQ(made.result, Ok);
  EXPECT_EQ(Decrypt(client, made.wrapped).key, made.key);
  // The cached status answers without probing, and so does the certificate.
  KmsStatus status;
  client.GetStatus(status);
  std::string pem, reason;
  EXPECT_EQ(client.GetRemoteServerCertificate(0, pem, reason), Ok);
  EXPECT_NE(pem.find("-----BEGIN CERTIFICATE-----"), std::string::npos);
  EXPECT_EQ(relay.connections(), afterProbe);

  // A key wrapped under another master key bypasses the cache.
  Op other = Generate(KmipKms(OnPyKmip("aes128")), 16);
  EXPECT_EQ(Decrypt(client, other.wrapped).result, Ok);
  EXPECT_GT(relay.connections(), afterProbe);
}

// Key operations on a client without a cached key share one read of it.
TEST_F(KmipKmsServerTest, ConcurrentColdOperationsShareOneReadOfTheMasterKey) {
  TcpRelay relay(TcpRelay::Mode::kForward, KmipPort());
  KmipKms client(Provider(TestKey("aes256").id, {relay.port()}));
  std::atomic<int> succeeded{0};
  std::vector<std::thread> callers;
  for (int i = 0; i < 8; ++i) {
    callers.emplace_back([&] { succeeded += Generate(client).result == Ok ? 1 : 0; });
  }
  for (auto& caller : callers) caller.join();
  EXPECT_EQ(succeeded, 8);
  EXPECT_EQ(relay.connections(), 1u);
}

TEST_F(KmipKmsServerTest, RemoteCertificateIsFetchedWithoutTrust) {
  std::string pem, reason;
  ASSERT_EQ(KmipKms(OnPyKmip("aes256", "")).FetchServerCertificate(0, pem, reason), Ok) << reason;
  std::string expected = PkiPem("server");
  namespace Ssl = Kestrel::Common::SslUtils;
  ASSERT_TRUE(
      Ssl::StandardizePemString(Ssl::kCertificateHeader, Ssl::kCertificateFooter, expected));
  EXPECT_EQ(pem, expected);
}

TEST_F(KmipKmsServerTest, CredentialsAreSentWithEveryKeyCommandAndNeverLogged) {
  FakeKmipServer fake(Kmip::KeyServer("mk", std::vector<uint8_t>(16, 3), 2));
  auto info = Provider("mk", {fake.port()});
  info->userName = "alice";
  info->password.assign("p}a,s{s'");
  ASSERT_EQ(Generate(KmipKms(info), 16).result, Ok);
  auto requests = fake.requests();
  ASSERT_EQ(requests.size(), 2u);  // Get, then Get Attributes
  for (const auto& request : requests) {
    auto seen = Kmip::ReadRequest(request);
    EXPECT_TRUE(seen.hasCredential);
    EXPECT_EQ(seen.username + "/" + seen.password, "alice/p}a,s{s'");
  }
  EXPECT_EQ(log_.Count("p}a,s{s'"), 0u);
}

}  // namespace
