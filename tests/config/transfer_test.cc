#include "config/config_transfer.h"
#include "config/trust_material.h"
#include "tests/config/config_fixture.h"

namespace {

using namespace Zyrd::Config;
using namespace ZyrdTest;

const std::string kEmptyExport =
    R"({"format":"orna-configstore-export","version":1,)"
    R"("scope":[{"key":"providers","group":"kms","component":"orna"}],"objects":[]})";

using TransferTest = ConfigTest;

TEST_F(TransferTest, ExportOfNoProvidersStillGivesATextAndItsDigest) {
  std::string config, digest;
  ASSERT_EQ(ExportConfig(config, digest), kStoreOk);
  EXPECT_EQ(config, kEmptyExport);
  EXPECT_EQ(digest, "8557fcff2f638fd54f377a79fe61633d250d4ed2139f743f48269e930b7a88b6");
}

TEST_F(TransferTest, ExportCoversProvidersOnlyAndImportPutsThemBackWhole) {
  CreateProvider("p1");
  CreateProvider("p2", false);
  ASSERT_EQ(SetCredential("p1", "secret"), kStoreOk);
  ASSERT_EQ(SetServerCertificates("p2", {"c1", "c2"}), kStoreOk);
  auto vouchd = std::make_shared<ConfigStoreObject>(
      ConfigStoreObjectId("certificate", "attestation", "orna"));
  vouchd->SetValue("certificate", std::string("VOUCHD-PEM"));
  real_->WriteObject(vouchd, 0);

  std::string config, digest;
  ASSERT_EQ(ExportConfig(config, digest), kStoreOk);
  EXPECT_EQ(config.find("VOUCHD-PEM"), std::string::npos);
  EXPECT_EQ(digest.size(), 64u);

  ASSERT_EQ(DeleteProvider("p1"), kStoreOk);
  CreateProvider("p3");
  ASSERT_EQ(ImportConfig(config), kStoreOk);

  std::string again, againDigest;
  ASSERT_EQ(ExportConfig(again, againDigest), kStoreOk);
  EXPECT_EQ(again, config);
  EXPECT_EQ(againDigest, digest);
  std::string credential;
  ASSERT_EQ(GetCredential("p1", credential), kStoreOk);
  EXPECT_EQ(credential, "secret");
  EXPECT_NE(real_->GetObject(vouchd->GetConfigStoreObjectId()), nullptr);

  ASSERT_EQ(ImportConfig(kEmptyExport), kStoreOk);  // an empty configuration empties
  std::vector<std::string> ids{"x"};
  ASSERT_EQ(ListProviderIds(ids), kStoreOk);
  EXPECT_TRUE(ids.empty());
}

TEST_F(TransferTest, FailedDigestFailsTheExport) {
  CreateProvider("p1");
  std::string config = "untouched", digest = "untouched";
  EXPECT_EQ(ExportConfig(config, digest, [](std::string_view, std::string&) { return false; }),
            kStoreError);
  EXPECT_TRUE(log_.Has(2, "Hash computation failed while exporting\n"));
  EXPECT_EQ(config, "untouched");
  EXPECT_EQ(digest, "untouched");
}

TEST_F(TransferTest, StoreFailuresAndRefusedTextsGive2AndChangeNothing) {
  CreateProvider("p1");
  const std::string before = ExportAll();

  EXPECT_EQ(ImportConfig("{\"format\":\"orna-configstore-export\",\"version\":2}"), kStoreError);
  EXPECT_TRUE(log_.Has(2, "Failed to import the given configuration\n"));
  EXPECT_EQ(ExportAll(), before);

  store_->FailOn(ThrowingStore::kImport);
  store_->FailOn(ThrowingStore::kExport);
  EXPECT_EQ(ImportConfig(kEmptyExport), kStoreError);
  ExpectInjected("Exception during import of config store: ");
  std::string config, digest;
  EXPECT_EQ(ExportConfig(config, digest), kStoreError);
  ExpectInjected("Exception during export of config store: ");
  EXPECT_EQ(ExportAll(), before);
}

TEST_F(TransferTest, RestoreMarksEveryProviderAndZyrdConfig) {
  auto restored = [&] {
    log_.Clear();
    RestoreConfig();
    std::vector<std::string> lines;
    for (const auto& line : log_.Lines()) {
      if (line.level == 5 && line.text.rfind("Restoring", 0) == 0) lines.push_back(line.text);
    }
    return lines;
  };
  EXPECT_EQ(restored(), std::vector<std::string>{"Restoring configuration key zyrd_config\n"});
  EXPECT_TRUE(real_->GetBootStatus(ConfigStoreObjectId("zyrd_config", "kms", "orna")));

  CreateProvider("p2");
  CreateProvider("p1");
  EXPECT_EQ(restored(),
            (std::vector<std::string>{"Restoring configuration key providers instance p1\n",
                                      "Restoring configuration key providers instance p2\n",
                                      "Restoring configuration key zyrd_config\n"}));
  EXPECT_TRUE(real_->GetBootStatus(ConfigStoreObjectId("providers", "kms", "orna", "p1")));
  EXPECT_TRUE(real_->GetBootStatus(ConfigStoreObjectId("providers", "kms", "orna", "p2")));
}

TEST_F(TransferTest, RestoreFailuresAreLoggedAndNeverStopIt) {
  CreateProvider("p1");
  CreateProvider("p2");
  store_->FailOn(ThrowingStore::kBootStatus);
  RestoreConfig();
  const std::string injected = std::string(": ") + kInjected + "\n";
  EXPECT_TRUE(log_.Has(2, "Failed to restore configuration key providers instance p1" + injected));
  EXPECT_TRUE(log_.Has(2, "Failed to restore configuration key providers instance p2" + injected));
  EXPECT_TRUE(log_.Has(2, "Failed to restore configuration key zyrd_config" + injected));

  log_.Clear();
  store_->FailOn(ThrowingStore::kDesired);
  RestoreConfig();
  EXPECT_TRUE(log_.Has(2, "Failed to restore configuration key providers" + injected));
  EXPECT_TRUE(log_.Has(5, "Restoring configuration key zyrd_config\n"));
}

}  // namespace
