#include "config/provider_config.h"

#include "config/config_lock.h"
#include "config/trust_material.h"
#include "tests/config/config_fixture.h"
#include "tests/support/test_certs.h"

namespace {

using namespace Zyrd::Config;
using namespace ZyrdTest;
namespace Svc = Com::Tarsel::Orna::Kms::ProvidersSvc;

using ProviderConfigTest = ConfigTest;

TEST_F(ProviderConfigTest, ProviderReadsBackAsWrittenWithServersInConfiguredOrder) {
  CreateProvider("p1");
  std::shared_ptr<Svc::Info> info;
  ASSERT_EQ(ReadProviderInfo("p1", info), kStoreOk);
  Svc::Info expected;
  expected.masterKeyId = "mk-p1";
  expected.keyServer.type = Svc::KeyServerType::Open("KMIP");
  expected.keyServer.description = "desc";
  expected.keyServer.proxyServer = Svc::NetworkAddress{"proxy.example", 3128};
  expected.keyServer.connectionTimeout = 30;
  expected.keyServer.kmipServer.username = "alice";
  expected.keyServer.kmipServer.servers = {{"s2", {"kms2.example", 5696}},
                                           {"s1", {"kms1.example", 5697}}};
  EXPECT_EQ(*info, expected);

  // An unset time-out, an empty username and the optional parts read back
  // as absent.
  ProviderConfigObjects o;
  o.name = "bare";
  ASSERT_EQ(CreateProviderObjects(o), kStoreOk);
  SetMasterKeyId(o, "mk");
  SetType(o, "KMIP");
  SetConnectionTimeout(o, -1);
  SetUserName(o, "");
  ASSERT_EQ(WriteProvider(o), kStoreOk);
  ASSERT_EQ(ReadProviderInfo("bare", info), kStoreOk);
  EXPECT_EQ(info->keyServer.description, "");
  EXPECT_FALSE(info->keyServer.proxyServer || info->keyServer.connectionTimeout ||
               info->keyServer.kmipServer.username);
  EXPECT_TRUE(info->keyServer.kmipServer.servers.empty());
  Zyrd::Kms::KmsInfo client;
  ASSERT_EQ(ReadClientConfig("bare", client), kStoreOk);
  EXPECT_EQ(client.connectionTimeout, 0);  // the client's default, not -1
}

TEST_F(ProviderConfigTest, UpdatingAWorkingSetReplacesServersAndProxy) {
  CreateProvider("p1", /*withProxy=*/false);
  ProviderConfigObjects o;
  ASSERT_EQ(GetProviderObjects("p1", o), kStoreOk);
  ASSERT_EQ(SetProxy(o, "proxy.new", 8080), kStoreOk);
  ASSERT_EQ(DeleteAllServers(o), kStoreOk);
  ASSERT_EQ(AddServer(o, "only", "kms.new", 1), kStoreOk);
  EXPECT_EQ(AddServer(o, "only", "kms.other", 2), kStoreError);
  ASSERT_EQ(WriteProvider(o), kStoreOk);
  std::shared_ptr<Svc::Info> info;
  ASSERT_EQ(ReadProviderInfo("p1", info), kStoreOk);
  EXPECT_EQ(info->keyServer.proxyServer, (Svc::NetworkAddress{"proxy.new", 8080}));
  EXPECT_EQ(info->keyServer.kmipServer.servers,
            (std::vector<Svc::Server>{{"only", {"kms.new", 1}}}));

  ASSERT_EQ(GetProviderObjects("p1", o), kStoreOk);
  ASSERT_EQ(SetProxy(o, "", 0), kStoreOk);  // an empty hostname removes the proxy
  ASSERT_EQ(WriteProvider(o), kStoreOk);
  ASSERT_EQ(ReadProviderInfo("p1", info), kStoreOk);
  EXPECT_FALSE(info->keyServer.proxyServer.has_value());
}

TEST_F(ProviderConfigTest, ExistingProviderGives1AndMissingOnesOrPartsGive3) {
  CreateProvider("p1");
  std::string before = ExportAll();
  ProviderConfigObjects o;
  o.name = "p1";
  EXPECT_EQ(CreateProviderObjects(o), kStoreAlreadyExists);
  EXPECT_EQ(o.provider, nullptr);
  EXPECT_EQ(ExportAll(), before);

  std::shared_ptr<Svc::Info> info;
  Zyrd::Kms::KmsInfo client;
  EXPECT_EQ(ReadProviderInfo("nope", info), kStoreNotFound);
  EXPECT_EQ(ReadClientConfig("nope", client), kStoreNotFound);
  EXPECT_EQ(DeleteProvider("nope"), kStoreNotFound);
  real_->WriteObject(std::make_shared<ConfigStoreObject>(
                         ConfigStoreObjectId("providers", "kms", "orna", "hollow")),
                     0);
  EXPECT_EQ(GetProviderObjects("hollow", o), kStoreNotFound);
}

TEST_F(ProviderConfigTest, StoreExceptionsGive2WithTheirLogLines) {
  CreateProvider("p1");
  ProviderConfigObjects o;
  ASSERT_EQ(GetProviderObjects("p1", o), kStoreOk);
  store_->FailOn(ThrowingStore::kWrite);
  EXPECT_EQ(WriteProvider(o), kStoreError);
  ExpectInjected("Error writing to config store: ");

  store_->FailOn(ThrowingStore::kFilter);
  std::vector<std::string> ids{"kept"};
  EXPECT_EQ(ListProviderIds(ids), kStoreError);
  EXPECT_EQ(ids, std::vector<std::string>{"kept"});
  ExpectInjected("Error reading providers from config store ");

  store_->FailOn(ThrowingStore::kDelete);
  EXPECT_EQ(DeleteProvider("p1"), kStoreError);
  ExpectInjected("Failed to delete provider p1 from configstore: ");

  store_->FailOn(ThrowingStore::kGet);
  std::shared_ptr<Svc::Info> info;
  EXPECT_EQ(ReadProviderInfo("p1", info), kStoreError);
  ExpectInjected("Error getting provider config store object: ");
  std::string key;
  EXPECT_FALSE(ReadVouchdPublicKey(key));
  ExpectInjected("Exception reading property 'certificate' from config store: ");
}

TEST_F(ProviderConfigTest, StoredValuesOfTheWrongTypeOrMissingGive2) {
  CreateProvider("p1");
  Tamper("p1",
         [](ProviderConfigObjects& o) { o.servers[1]->SetValue("port", std::string("5697")); });
  std::shared_ptr<Svc::Info> info;
  Zyrd::Kms::KmsInfo client;
  EXPECT_EQ(ReadProviderInfo("p1", info), kStoreError);
  EXPECT_EQ(ReadClientConfig("p1", client), kStoreError);
  EXPECT_EQ(log_.Count("Exception reading port from config store: value 'port'"), 2u);
  EXPECT_EQ(info, nullptr);
  EXPECT_TRUE(client.masterKeyId.empty());

  CreateProvider("p2");
  Tamper("p2", [](ProviderConfigObjects& o) { o.provider->DeleteValue("master_key_id"); });
  EXPECT_EQ(ReadProviderInfo("p2", info), kStoreError);
  EXPECT_EQ(ReadClientConfig("p2", client), kStoreError);
}

TEST_F(ProviderConfigTest, ClientConfigurationCarriesTrustMaterialStandardised) {
  const TestCert cert = MakeSelfSignedCert("client");
  const std::string& pem = cert.certificatePem;
  std::string messy = pem;  // CR LF line ends: standardises back to `pem`
  for (size_t i = 0; (i = messy.find('\n', i)) != std::string::npos; i += 2) messy.insert(i, "\r");

  CreateProvider("p1");
  ASSERT_EQ(SetCredential("p1", "s3cret"), kStoreOk);
  ASSERT_EQ(SetServerCertificates("p1", {messy, "not a pem", pem}), kStoreOk);
  Zyrd::Kms::KmsInfo client;
  ASSERT_EQ(ReadClientConfig("p1", client), kStoreOk);
  EXPECT_EQ(client.name + " " + client.masterKeyId + " " + client.proxyHost + ":" +
                std::to_string(client.proxyPort) + " " + std::to_string(client.connectionTimeout) +
                " " + client.userName + "/" + std::string(client.password.view()),
            "p1 mk-p1 proxy.example:3128 30 alice/s3cret");
  ASSERT_EQ(client.servers.size(), 2u);
  EXPECT_EQ(client.servers[0].name + " " + client.servers[0].hostname + ":" +
                std::to_string(client.servers[0].port) + " " + client.servers[1].name,
            "s2 kms2.example:5696 s1");
  EXPECT_EQ(client.trustedServerCertificates, (std::vector<std::string>{pem, "not a pem", pem}));
  EXPECT_EQ(log_.Count("Failed to standardize certificate.\n"), 1u);
  EXPECT_EQ(client.clientCertificate, "");  // none configured: not an error

  ASSERT_EQ(SetClientCertificate("p1", messy, cert.privateKeyPem), kStoreOk);
  ASSERT_EQ(ReadClientConfig("p1", client), kStoreOk);
  EXPECT_EQ(client.clientCertificate, pem);
  EXPECT_EQ(client.clientPrivateKey.view(), cert.privateKeyPem);

  Tamper("p1", [](ProviderConfigObjects& o) {
    o.kmipServer->GetSubObject(SubObjectId("client_certificate"))->DeleteValue("private_key");
  });
  EXPECT_EQ(ReadClientConfig("p1", client), kStoreError);
}

TEST_F(ProviderConfigTest, ListsAndHostsFollowTheStore) {
  CreateProvider("b");
  CreateProvider("a", /*withProxy=*/false);
  std::vector<std::shared_ptr<Svc::Summary>> providers;
  ASSERT_EQ(ListProviders(providers), kStoreOk);
  ASSERT_EQ(providers.size(), 2u);
  EXPECT_EQ(providers[0]->provider + providers[1]->provider, "ab");

  std::vector<std::string> hosts{"earlier"};
  std::string proxy = "untouched";
  ASSERT_EQ(GetProviderHosts("a", true, true, hosts, proxy), kStoreOk);
  EXPECT_EQ(hosts, (std::vector<std::string>{"earlier", "kms2.example", "kms1.example"}));
  EXPECT_EQ(proxy, "untouched");
  hosts.clear();
  ASSERT_EQ(GetProviderHosts("b", false, true, hosts, proxy), kStoreOk);
  EXPECT_TRUE(hosts.empty());
  EXPECT_EQ(proxy, "proxy.example");
  EXPECT_EQ(GetProviderHosts("nope", true, true, hosts, proxy), kStoreNotFound);

  ASSERT_EQ(DeleteProvider("b"), kStoreOk);
  std::vector<std::string> ids;
  ASSERT_EQ(ListProviderIds(ids), kStoreOk);
  EXPECT_EQ(ids, std::vector<std::string>{"a"});
}

TEST_F(ProviderConfigTest, VouchdKeyComesFromTheStoredCertificate) {
  std::string key = "untouched";
  EXPECT_FALSE(ReadVouchdPublicKey(key));
  EXPECT_TRUE(log_.Has(2, "Vouchd certificate is empty.\n"));

  auto object = std::make_shared<ConfigStoreObject>(
      ConfigStoreObjectId("certificate", "attestation", "orna"));
  object->SetValue("certificate", std::string("garbage"));
  real_->WriteObject(object, 0);
  EXPECT_FALSE(ReadVouchdPublicKey(key));
  EXPECT_EQ(key, "untouched");

  const TestCert cert = MakeSelfSignedCert("vouchd");
  object->SetValue("certificate", cert.certificatePem);
  real_->WriteObject(object, 0);
  ASSERT_TRUE(ReadVouchdPublicKey(key));
  EXPECT_EQ(key, cert.publicKeyPem);
}

TEST(ConfigLock, IsOneNamedLockTakenBeforeTheProvidersStateLock) {
  EXPECT_EQ(ConfigLock().Name(), "configLock");
  UserLock::RWLockPtr providersState("providersState", 0xff000000);
  UserLock::WriteGuard config(ConfigLock());
  UserLock::ReadGuard state(*providersState);  // in rank order: no panic
}

}  // namespace
