// The key server client against a real KMIP server (PyKMIP), and against the
// fake server for faults a real server does not produce.
#include <gtest/gtest.h>

#include "kms/kmip_kms.h"
#include "platform/ssl/ssl_utils.h"
#include "platform/util/base64.h"
#include "tests/support/kmip_messages.h"
#include "tests/support/log_capture.h"
#include "tests/support/loopback_server.h"
#include "tests/support/pykmip_server.h"

namespace {

using namespace Zyrd::Kms;
using ZyrdTest::FakeKmipServer;
using ZyrdTest::PyKmipServer;
using ZyrdTest::TcpRelay;
using ZyrdTest::TestPki;

std::vector<uint8_t> Unhex(const std::string& hex) {
  std::vector<uint8_t> out;
  for (size_t i = 0; i + 1 < hex.size(); i += 2) {
    out.push_back(static_cast<uint8_t>(std::stoi(hex.substr(i, 2), nullptr, 16)));
  }
  return out;
}

std::vector<uint8_t> Decode(const Groundwork::SecureString& text) {
  std::vector<uint8_t> out;
  EXPECT_TRUE(Base64_Decode(text.view(), &out));
  return out;
}

class KmipKmsServerTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    pki_ = new TestPki();
    server_ = new PyKmipServer(*pki_);
    ASSERT_TRUE(server_->started()) << server_->error();
    auto ids = server_->Admin({{"create", "128"}, {"activate", "$1"},
                               {"create", "256"}, {"activate", "$3"},
                               {"create", "256"},
                               {"create", "256"}, {"activate", "$6"}, {"revoke", "$6", "deactivated"},
                               {"create", "256"}, {"activate", "$9"}, {"revoke", "$9", "compromised"}});
    ASSERT_EQ(ids.size(), 11u) << server_->error();
    key128_ = ids[0];
    key256_ = ids[2];
    preActive_ = ids[4];
    deactivated_ = ids[5];
    compromised_ = ids[8];
  }
  static void TearDownTestSuite() {
    delete server_;
    delete pki_;
  }

  // A provider whose servers are all on `ports` of the loopback address.
  std::shared_ptr<KmsInfo> Provider(const std::string& masterKey, std::vector<uint16_t> ports,
                                    const std::string& trusted = "ca",
                                    const std::string& client = "client") {
    auto info = std::make_shared<KmsInfo>();
    info->name = "p1";
    info->masterKeyId = masterKey;
    info->connectionTimeout = 5;
    info->clientCertificate = pki_->Pem(client);
    info->clientPrivateKey = pki_->Key(client);
    if (!trusted.empty()) info->trustedServerCertificates = {pki_->Pem(trusted)};
    for (size_t i = 0; i < ports.size(); ++i) {
      info->servers.push_back({"s" + std::to_string(i + 1), "127.0.0.1", ports[i]});
    }
    return info;
  }

  static TestPki* pki_;
  static PyKmipServer* server_;
  static std::string key128_, key256_, preActive_, deactivated_, compromised_;
  ZyrdTest::LogCapture log_;
};

TestPki* KmipKmsServerTest::pki_ = nullptr;
PyKmipServer* KmipKmsServerTest::server_ = nullptr;
std::string KmipKmsServerTest::key128_, KmipKmsServerTest::key256_, KmipKmsServerTest::preActive_,
    KmipKmsServerTest::deactivated_, KmipKmsServerTest::compromised_;

TEST_F(KmipKmsServerTest, GenerateThenDecryptRoundTripsUnderBothKeySizes) {
  for (const std::string& masterKey : {key128_, key256_}) {
    KmipKms client(Provider(masterKey, {server_->port()}));
    for (uint32_t size : {1u, 16u, 32u, 64u, 1000u}) {
      Groundwork::SecureString key, back;
      std::string wrapped, reason;
      ASSERT_EQ(client.GenerateKey(0, size, key, wrapped, reason), Ok) << reason;
      EXPECT_EQ(Decode(key).size(), size);
      ASSERT_EQ(client.Decrypt(0, wrapped, back, reason), Ok) << reason;
      EXPECT_EQ(back, key);
    }
  }
  EXPECT_TRUE(log_.Has(0, "Operation : 'GenerateKey', masterKeyId : '" + key256_ + "'\n"));
  EXPECT_TRUE(log_.Has(0, "Operation : 'Decrypt'\n"));
}

TEST_F(KmipKmsServerTest, AKeyWrappedOnOneServerUnwrapsThroughAnotherHoldingTheSameKey) {
  std::vector<uint8_t> bytes = Unhex(server_->KeyHex(key256_));
  ASSERT_EQ(bytes.size(), 32u);
  FakeKmipServer twin(pki_->Pem("server"), pki_->Key("server"),
                      ZyrdTest::Kmip::KeyServer(key256_, bytes, 2));

  Groundwork::SecureString key, back;
  std::string wrapped, reason;
  ASSERT_EQ(KmipKms(Provider(key256_, {server_->port()})).GenerateKey(0, 32, key, wrapped, reason),
            Ok);
  KmipKms other(Provider(key256_, {twin.port()}));
  ASSERT_EQ(other.Decrypt(0, wrapped, back, reason), Ok) << reason;
  EXPECT_EQ(back, key);
}

TEST_F(KmipKmsServerTest, KeyStatesDecideWhatEachOperationMayDo) {
  Groundwork::SecureString key, back;
  std::string wrapped, reason;

  // Wrap one key under each master key while the server still lets us read
  // the key bytes; then exercise decrypt against the states.
  KmipKms preActive(Provider(preActive_, {server_->port()}));
  EXPECT_EQ(preActive.GenerateKey(0, 32, key, wrapped, reason), MasterKeyPreActive);
  EXPECT_EQ(reason, "The Key is in pre-active state and needs to be activated");

  for (const std::string& id : {deactivated_, compromised_}) {
    log_.Clear();
    KmipKms client(Provider(id, {server_->port()}));
    EXPECT_EQ(client.GenerateKey(0, 32, key, wrapped, reason), MasterKeyUnusableForEncryption);
    EXPECT_EQ(log_.Count("Failed to generate key. Could not fetch master key or it is not usable. "
                         "Key " + id + ", provider p1, server s1, reason The key is in "
                         "deactivated or compromised state"),
              1u);

    // A data key sealed under this master key (with the bytes the server
    // returns whatever the state) still unwraps, after a warning.
    FakeKmipServer active(pki_->Pem("server"), pki_->Key("server"),
                          ZyrdTest::Kmip::KeyServer(id, Unhex(server_->KeyHex(id)), 2));
    ASSERT_EQ(KmipKms(Provider(id, {active.port()})).GenerateKey(0, 32, key, wrapped, reason), Ok);
    ASSERT_EQ(client.Decrypt(0, wrapped, back, reason), Ok) << reason;
    EXPECT_EQ(back, key);
    EXPECT_EQ(log_.Count("Proceeding to decrpt with a key which is deactivated or compromised. "
                         "Key " + id + ", provider p1, server s1"),
              1u);
  }

  // Destroying removes the object on this server: the key is then not found.
  std::string doomed = server_->CreateKey(256, true);
  ASSERT_FALSE(doomed.empty());
  KmipKms client(Provider(doomed, {server_->port()}));
  ASSERT_EQ(client.GenerateKey(0, 16, key, wrapped, reason), Ok);
  ASSERT_TRUE(server_->Revoke(doomed, "deactivated"));
  ASSERT_TRUE(server_->Destroy(doomed));
  EXPECT_EQ(client.Decrypt(0, wrapped, back, reason), MasterKeyNotFound);
  EXPECT_TRUE(log_.Has(3, "Overriding the result to NotFound for server s1 of provider p1\n"));
}

TEST_F(KmipKmsServerTest, DestroyedStatesFromTheFakeServer) {
  for (int state : {5, 6}) {
    FakeKmipServer fake(pki_->Pem("server"), pki_->Key("server"),
                        ZyrdTest::Kmip::KeyServer("mk", std::vector<uint8_t>(32, 7), state));
    KmipKms client(Provider("mk", {fake.port()}));
    Groundwork::SecureString key;
    std::string wrapped, reason;
    EXPECT_EQ(client.GenerateKey(0, 32, key, wrapped, reason), MasterKeyUnusable) << state;
    EXPECT_EQ(reason, "The key is in destroyed or destroyed compromised state");
  }
}

TEST_F(KmipKmsServerTest, FaultsMapToTheirResults) {
  Groundwork::SecureString key;
  std::string wrapped, reason;

  // A server that accepts and never answers: the time-out is reported as
  // such, not as a missing key.
  FakeKmipServer silent(pki_->Pem("server"), pki_->Key("server"), nullptr,
                        FakeKmipServer::Mode::kNoHandshake);
  auto info = Provider("mk", {silent.port()});
  info->connectionTimeout = 1;
  EXPECT_EQ(KmipKms(info).GenerateKey(0, 16, key, wrapped, reason), KeyServerTimeout);

  // An answer without key material, and a malformed answer, are library
  // failures that surface as a missing master key.
  FakeKmipServer noKey(pki_->Pem("server"), pki_->Key("server"),
                       [](const std::vector<uint8_t>& request) {
                         auto seen = ZyrdTest::Kmip::ReadRequest(request);
                         ZyrdTest::FakeReply reply;
                         reply.bytes = ZyrdTest::Kmip::KeyWithoutMaterial(seen.id);
                         return reply;
                       });
  log_.Clear();
  EXPECT_EQ(KmipKms(Provider("mk", {noKey.port()})).GenerateKey(0, 16, key, wrapped, reason),
            MasterKeyNotFound);
  EXPECT_FALSE(reason.empty());
  EXPECT_EQ(log_.Count("Failed to find key in the response"), 1u);

  FakeKmipServer garbage(pki_->Pem("server"), pki_->Key("server"),
                         [](const std::vector<uint8_t>&) {
                           ZyrdTest::FakeReply reply;
                           // Complete framing around an item of an unknown type.
                           reply.bytes = {0x42, 0x00, 0x7b, 0x01, 0x00, 0x00, 0x00, 0x08,
                                          0x42, 0x00, 0x7c, 0xff, 0x00, 0x00, 0x00, 0x00};
                           return reply;
                         });
  EXPECT_EQ(KmipKms(Provider("mk", {garbage.port()})).GenerateKey(0, 16, key, wrapped, reason),
            MasterKeyNotFound);

  // Nothing listening: a communication error.
  uint16_t closed;
  {
    TcpRelay gone(TcpRelay::Mode::kForward, 1);
    closed = gone.port();
  }
  EXPECT_EQ(KmipKms(Provider("mk", {closed})).GenerateKey(0, 16, key, wrapped, reason),
            KeyServerCommunicationError);

  // A text that is not a wrapped key fails before any server is asked.
  log_.Clear();
  Groundwork::SecureString back;
  EXPECT_EQ(KmipKms(Provider("mk", {closed})).Decrypt(0, "zyrwk.v1.nope", back, reason),
            MetadataFailure);
  EXPECT_EQ(reason, "Failed to read metadata");
  EXPECT_TRUE(log_.Lines().empty());
}

TEST_F(KmipKmsServerTest, ProbeReportsTrustInBothDirectionsAndTheMasterKey) {
  KmsStatus status;
  KmipKms healthy(Provider(key256_, {server_->port()}));
  healthy.GetStatus(status);
  ASSERT_EQ(status.servers.size(), 1u);
  EXPECT_TRUE(status.servers[0].clientTrustServer);
  EXPECT_TRUE(status.servers[0].serverTrustClient);
  EXPECT_TRUE(status.servers[0].errors.empty());
  EXPECT_TRUE(status.masterKeyFound && status.masterKeyUsable && status.keySizeSupported);
  EXPECT_TRUE(status.masterKeyErrors.empty());

  // The client trusts another CA; the server accepts the client.
  log_.Clear();
  KmipKms untrusted(Provider(key256_, {server_->port()}, "other_ca"));
  untrusted.GetStatus(status);
  ASSERT_EQ(status.servers.size(), 1u);
  EXPECT_FALSE(status.servers[0].clientTrustServer);
  EXPECT_TRUE(status.servers[0].serverTrustClient);
  EXPECT_EQ(status.servers[0].errors.count(
                "com.tarsel.orna.kms.providers.statussvc.client_not_trusting_server"),
            1u);
  EXPECT_FALSE(status.masterKeyFound);
  EXPECT_EQ(status.masterKeyErrors, std::vector<KmsResult>{MasterKeyNotFound});
  EXPECT_TRUE(log_.Has(3, "Key server s1 of provider p1 is unhealthy\n"));

  // Neither side trusts the other.
  KmipKms refused(Provider(key256_, {server_->port()}, "other_ca", "other_client"));
  refused.GetStatus(status);
  EXPECT_FALSE(status.servers[0].clientTrustServer);
  EXPECT_FALSE(status.servers[0].serverTrustClient);
  EXPECT_EQ(status.servers[0].errors.size(), 2u);

  // A master key of 192 bits is found and usable but of unsupported size.
  FakeKmipServer odd(pki_->Pem("server"), pki_->Key("server"),
                     ZyrdTest::Kmip::KeyServer("odd", std::vector<uint8_t>(24, 1), 2));
  KmipKms oddClient(Provider("odd", {odd.port()}));
  oddClient.GetStatus(status);
  EXPECT_TRUE(status.masterKeyFound && status.masterKeyUsable);
  EXPECT_FALSE(status.keySizeSupported);
  EXPECT_EQ(status.masterKeyErrors, std::vector<KmsResult>{MasterKeyLengthUnsupported});
}

TEST_F(KmipKmsServerTest, CachedStatusServesKeyOperationsWithoutAnyConnection) {
  TcpRelay relay(TcpRelay::Mode::kForward, server_->port());
  KmipKms client(Provider(key256_, {relay.port()}));
  client.UpdateStatus();
  size_t afterProbe = relay.connections();
  EXPECT_GT(afterProbe, 0u);

  Groundwork::SecureString key, back;
  std::string wrapped, reason;
  ASSERT_EQ(client.GenerateKey(0, 32, key, wrapped, reason), Ok);
  ASSERT_EQ(client.Decrypt(0, wrapped, back, reason), Ok);
  EXPECT_EQ(back, key);
  EXPECT_EQ(relay.connections(), afterProbe);
  EXPECT_TRUE(log_.Has(6, "Provider p1 using cached key and state\n"));

  // The cached status answers without probing, and so does the certificate.
  KmsStatus status;
  client.GetStatus(status);
  std::string pem;
  EXPECT_EQ(client.GetRemoteServerCertificate(0, pem, reason), Ok);
  EXPECT_NE(pem.find("-----BEGIN CERTIFICATE-----"), std::string::npos);
  EXPECT_EQ(relay.connections(), afterProbe);

  // A key wrapped under another master key bypasses the cache.
  ASSERT_EQ(KmipKms(Provider(key128_, {server_->port()})).GenerateKey(0, 16, key, wrapped, reason),
            Ok);
  ASSERT_EQ(client.Decrypt(0, wrapped, back, reason), Ok);
  EXPECT_GT(relay.connections(), afterProbe);
}

TEST_F(KmipKmsServerTest, RemoteCertificateIsFetchedWithoutTrust) {
  KmipKms client(Provider(key256_, {server_->port()}, ""));
  std::string pem, reason;
  ASSERT_EQ(client.FetchServerCertificate(0, pem, reason), Ok) << reason;
  std::string expected = pki_->Pem("server");
  ASSERT_TRUE(Kestrel::Common::SslUtils::StandardizePemString(
      Kestrel::Common::SslUtils::kCertificateHeader, Kestrel::Common::SslUtils::kCertificateFooter,
      expected));
  EXPECT_EQ(pem, expected);
}

TEST_F(KmipKmsServerTest, CredentialsAreSentWithEveryKeyCommand) {
  FakeKmipServer fake(pki_->Pem("server"), pki_->Key("server"),
                      ZyrdTest::Kmip::KeyServer("mk", std::vector<uint8_t>(16, 3), 2));
  auto info = Provider("mk", {fake.port()});
  info->userName = "alice";
  info->password = "p}a,s{s'";
  Groundwork::SecureString key;
  std::string wrapped, reason;
  ASSERT_EQ(KmipKms(info).GenerateKey(0, 16, key, wrapped, reason), Ok) << reason;
  auto requests = fake.requests();
  ASSERT_EQ(requests.size(), 2u);  // Get, then Get Attributes
  for (const auto& request : requests) {
    auto seen = ZyrdTest::Kmip::ReadRequest(request);
    EXPECT_TRUE(seen.hasCredential);
    EXPECT_EQ(seen.username, "alice");
    EXPECT_EQ(seen.password, "p}a,s{s'");
  }
  for (const auto& line : log_.Lines()) EXPECT_EQ(line.text.find("p}a,s{s'"), std::string::npos);
}

}  // namespace
