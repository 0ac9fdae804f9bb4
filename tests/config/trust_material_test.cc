#include "config/trust_material.h"

#include "tests/config/config_fixture.h"

namespace {

using namespace Zyrd::Config;
using namespace ZyrdTest;

class TrustMaterialTest : public ConfigTest {
 protected:
  void SetUp() override {
    ConfigTest::SetUp();
    CreateProvider("p1");
  }
};

TEST_F(TrustMaterialTest, EveryOperationOnAMissingProviderGives3) {
  std::string a = "a", b = "b";
  std::vector<std::string> list;
  EXPECT_EQ(GetCredential("nope", a), kStoreNotFound);
  EXPECT_EQ(SetCredential("nope", "x"), kStoreNotFound);
  EXPECT_EQ(GetClientCertificate("nope", a, b), kStoreNotFound);
  EXPECT_EQ(SetClientCertificate("nope", "c", "k"), kStoreNotFound);
  EXPECT_EQ(GetClientCsr("nope", a, b), kStoreNotFound);
  EXPECT_EQ(SetClientCsr("nope", "c", "k"), kStoreNotFound);
  EXPECT_EQ(GetServerCertificates("nope", list), kStoreNotFound);
  EXPECT_EQ(SetServerCertificates("nope", {"c"}), kStoreNotFound);
  EXPECT_EQ(a, "a");
  EXPECT_EQ(b, "b");
}

// Never-set material leaves the caller's output alone (a client certificate
// reads back empty); what is set reads back as given.
TEST_F(TrustMaterialTest, CredentialClientCertificateAndCsrRoundTrip) {
  std::string credential = "caller's", cert = "caller's", key = "caller's key", csr = "caller's",
              csrKey = "caller's key";
  ASSERT_EQ(GetCredential("p1", credential), kStoreOk);
  ASSERT_EQ(GetClientCertificate("p1", cert, key), kStoreOk);
  ASSERT_EQ(GetClientCsr("p1", csr, csrKey), kStoreOk);
  EXPECT_EQ(credential + "|" + cert + "|" + key + "|" + csr + "|" + csrKey,
            "caller's||caller's key|caller's|caller's key");

  ASSERT_EQ(SetCredential("p1", " pass word\n"), kStoreOk);
  ASSERT_EQ(SetClientCsr("p1", "CSR", "CSRKEY"), kStoreOk);
  ASSERT_EQ(GetClientCertificate("p1", cert, key), kStoreOk);
  EXPECT_EQ(cert, "");  // a CSR is not a client certificate
  ASSERT_EQ(SetClientCertificate("p1", "CERT", "KEY"), kStoreOk);
  ASSERT_EQ(SetClientCertificate("p1", "CERT2", "KEY2"), kStoreOk);  // replaces
  ASSERT_EQ(GetCredential("p1", credential), kStoreOk);
  ASSERT_EQ(GetClientCertificate("p1", cert, key), kStoreOk);
  ASSERT_EQ(GetClientCsr("p1", csr, csrKey), kStoreOk);
  EXPECT_EQ(credential + "|" + cert + "|" + key + "|" + csr + "|" + csrKey,
            " pass word\n|CERT2|KEY2|CSR|CSRKEY");
  EXPECT_EQ(log_.Count("pass word"), 0u);  // never logged

  Tamper("p1", [](ProviderConfigObjects& o) {
    o.kmipServer->GetSubObject(SubObjectId("client_certificate"))->DeleteValue("private_key");
  });
  EXPECT_EQ(GetClientCertificate("p1", cert, key), kStoreError);
}

TEST_F(TrustMaterialTest, ServerCertificatesNeverSetEmptyAndListed) {
  std::vector<std::string> certs{"earlier"};
  ASSERT_EQ(GetServerCertificates("p1", certs), kStoreOk);
  EXPECT_EQ(certs, std::vector<std::string>{"earlier"});

  ASSERT_EQ(SetServerCertificates("p1", {"c3", "c1", "c2"}), kStoreOk);
  ASSERT_EQ(GetServerCertificates("p1", certs), kStoreOk);
  EXPECT_EQ(certs, (std::vector<std::string>{"earlier", "c3", "c1", "c2"}));

  ASSERT_EQ(SetServerCertificates("p1", {}), kStoreOk);
  certs.clear();
  ASSERT_EQ(GetServerCertificates("p1", certs), kStoreOk);
  EXPECT_TRUE(certs.empty());
}

TEST_F(TrustMaterialTest, FailedCommitsGive2AndChangeNothing) {
  ASSERT_EQ(SetCredential("p1", "old"), kStoreOk);
  const std::string before = ExportAll();
  store_->FailOn(ThrowingStore::kUpdate);

  EXPECT_EQ(SetCredential("p1", "new"), kStoreError);
  ExpectInjected("Set credential failed to write to configstore: ");
  EXPECT_EQ(SetClientCertificate("p1", "c", "k"), kStoreError);
  ExpectInjected("Error writing client certificate to configstore: ");
  EXPECT_EQ(SetClientCsr("p1", "c", "k"), kStoreError);
  ExpectInjected("Caught ConfigStore exception during setting csr and key ");
  EXPECT_EQ(SetServerCertificates("p1", {"c"}), kStoreError);
  ExpectInjected("Error writing to configstore: ");
  EXPECT_EQ(ExportAll(), before);
}

TEST_F(TrustMaterialTest, MistypedStoredValuesGive2) {
  Tamper("p1", [](ProviderConfigObjects& o) {
    o.keyServer->SetValue("server_cert", std::string("one string, not a list"));
    o.kmipServer->CreateSubObject(SubObjectId("client_certificate"))->SetValue("certificate", 5L);
    o.kmipServer->CreateSubObject(SubObjectId("client_CSR"))->SetValue("private_key", 6L);
    o.kmipServer->SetValue("credential", 7L);
  });
  std::vector<std::string> certs;
  std::string a, b;
  EXPECT_EQ(GetServerCertificates("p1", certs), kStoreError);
  EXPECT_EQ(GetClientCertificate("p1", a, b), kStoreError);
  EXPECT_EQ(GetClientCsr("p1", a, b), kStoreError);
  EXPECT_EQ(GetCredential("p1", a), kStoreError);
  EXPECT_EQ(log_.Count("Exception reading "), 4u);
}

}  // namespace
