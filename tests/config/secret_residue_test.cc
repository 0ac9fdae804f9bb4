// Follows a credential and a private key from the caller through the store,
// its export and import, and into a key server client's configuration, and
// looks at every heap block freed on the way: none may still hold either.
#include "config/config_transfer.h"
#include "config/trust_material.h"
#include "tests/config/config_fixture.h"
#include "tests/support/freed_memory_scan.h"

namespace {

constexpr const char* kCredential = "credential-0f3a9c71e2b84d56a1c3";
constexpr const char* kPrivateKey = "PRIVATE-KEY-BODY-7d21e9f0b3c64a58";

using namespace Zyrd::Config;
using namespace ZyrdTest;

TEST_F(ConfigTest, SecretsLeaveNoCopyInFreedMemoryOnTheirWayToTheKeyServerClient) {
  CreateProvider("p1");
  std::string credential = kCredential, key = kPrivateKey;
  FreedMemoryScan scan({kCredential, kPrivateKey});

  ASSERT_EQ(SetCredential("p1", credential), kStoreOk);
  ASSERT_EQ(SetClientCertificate("p1", "certificate", key), kStoreOk);
  {
    Zyrd::Kms::KmsInfo client;
    ASSERT_EQ(ReadClientConfig("p1", client), kStoreOk);
    EXPECT_EQ(client.password.view(), kCredential);
    EXPECT_EQ(client.clientPrivateKey.view(), kPrivateKey);
  }
  {
    std::string config, digest;
    Groundwork::WipeOnExit wipe(config);
    ASSERT_EQ(ExportConfig(config, digest), kStoreOk);
    ASSERT_EQ(ImportConfig(config), kStoreOk);
  }
  std::string readBack, cert, readKey;
  Groundwork::WipeOnExit wipeCredential(readBack), wipeKey(readKey);
  ASSERT_EQ(GetCredential("p1", readBack), kStoreOk);
  ASSERT_EQ(GetClientCertificate("p1", cert, readKey), kStoreOk);
  EXPECT_EQ(readBack, kCredential);
  EXPECT_EQ(readKey, kPrivateKey);

  EXPECT_EQ(scan.Stop(), 0);
  OPENSSL_cleanse(credential.data(), credential.size());
  OPENSSL_cleanse(key.data(), key.size());
}

}  // namespace
