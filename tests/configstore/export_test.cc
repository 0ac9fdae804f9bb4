#include "tests/configstore/store_fixture.h"

namespace {

using namespace ZyrdTest;

const std::string kHead = R"({"format":"orna-configstore-export","version":1,)";
const std::string kScope = R"("scope":[{"key":"providers","group":"kms","component":"orna"}],)";
const std::string kObj = R"({"key":"providers","group":"kms","component":"orna","instance":"p9")";

class ExportTest : public StoreTest {
 protected:
  bool Import(const std::string& text) {
    errors_.clear();
    return Store().Import(text, errors_);
  }
  std::vector<ErrorInfo> errors_;
};

TEST_F(ExportTest, TextHasTheDocumentedShape) {
  auto p = std::make_shared<ConfigStoreObject>(ProviderId("p1"));
  p->SetValue("master_key_id", std::string("k1"));
  auto ks = p->CreateSubObject(SubObjectId("key_server"));
  ks->SetValue("type", std::string("KMIP"));
  ks->SetValue("connection_timeout", -1L);
  ks->SetValue("server_cert", std::vector<std::string>{"c\"1\n", "c2"});
  ks->CreateSubObject(SubObjectId("kmip_server"))->SetValue("username", std::string("u"));
  Store().WriteObject(p, 0);

  EXPECT_EQ(ExportProviders(),
            kHead + kScope +
                R"("objects":[{"key":"providers","group":"kms","component":"orna","instance":"p1",)"
                R"("values":{"master_key_id":"k1","provider":"p1"},)"
                R"("subObjects":[{"name":"key_server","instance":"",)"
                R"("values":{"connection_timeout":-1,"server_cert":["c\"1\n","c2"],"type":"KMIP"},)"
                R"("subObjects":[{"name":"kmip_server","instance":"","values":{"username":"u"},)"
                R"("subObjects":[]}]}]}]})");
}

TEST_F(ExportTest, EqualContentsGiveEqualTextsAndImportGivesTheTextBack) {
  Store().WriteObject(SampleProvider("p2", 7), 0);
  Store().WriteObject(SampleProvider("p1"), 0);
  const std::string text = ExportProviders();
  EXPECT_LT(text.find(R"("instance":"zeta")"), text.find(R"("instance":"alpha")"));  // stored order

  TempDir otherDir;
  auto other = SqliteConfigStore::Open(otherDir / "c.db");
  other->WriteObject(SampleProvider("p1"), 0);  // written in another order
  other->WriteObject(SampleProvider("p2", 7), 0);
  EXPECT_EQ(other->Export({ProvidersFilter()}), text);
  other->DeleteObject(ProviderId("p1"));
  std::vector<ErrorInfo> errors;
  ASSERT_TRUE(other->Import(text + "\n", errors));
  EXPECT_EQ(other->Export({ProvidersFilter()}), text);
}

TEST_F(ExportTest, ImportReplacesTheCoveredKeysOnly) {
  Store().WriteObject(SampleProvider("old"), 0);
  auto cert = std::make_shared<ConfigStoreObject>(
      ConfigStoreObjectId("certificate", "attestation", "orna"));
  Store().WriteObject(cert, 0);

  ASSERT_TRUE(Import(kHead + kScope + R"("objects":[]})"));  // an empty scope empties
  EXPECT_TRUE(Store().GetObjectsByFilter(ProvidersFilter()).empty());
  EXPECT_NE(Store().GetObject(cert->GetConfigStoreObjectId()), nullptr);

  // Without "scope" a text covers the keys of its objects.
  Store().WriteObject(SampleProvider("old"), 0);
  ASSERT_TRUE(
      Import(kHead + R"("objects":[)" + kObj + R"(,"values":{"n":-9223372036854775808}}]})"));
  auto all = Store().GetObjectsByFilter(ProvidersFilter());
  ASSERT_EQ(all.size(), 1u);
  long n = 0;
  EXPECT_TRUE(all[0]->GetValue("n", &n));
  EXPECT_EQ(n, LONG_MIN);
  ASSERT_TRUE(Import(kHead + R"("objects":[]})"));
  EXPECT_EQ(Store().GetObjectsByFilter(ProvidersFilter()).size(), 1u);
  EXPECT_NE(Store().GetObject(cert->GetConfigStoreObjectId()), nullptr);
}

TEST_F(ExportTest, RefusedTextsChangeNothingAndSayWhy) {
  Store().WriteObject(SampleProvider("p1"), 0);
  const std::string before = ExportProviders();
  auto withValues = [](const std::string& values) {
    return kHead + R"("objects":[)" + kObj + R"(,"values":)" + values + "}]}";
  };
  auto withSubs = [](const std::string& subs) {
    return kHead + R"("objects":[)" + kObj + R"(,"subObjects":)" + subs + "}]}";
  };
  for (const std::string& text :
       {std::string("not json"), before.substr(0, before.size() - 1), before + "x",
        std::string(R"({"format":"other","version":1,"objects":[]})"),
        std::string(R"({"format":"orna-configstore-export","version":"1","objects":[]})"),
        kHead + R"("objects":[],"extra":0})", kHead + R"("scope":[{"key":"k"}],"objects":[]})",
        withValues(R"({"port":1.5})"), withValues(R"({"port":null})"),
        withValues(R"({"port":18446744073709551615})"), withValues(R"({"l":["a",1]})"),
        withValues(R"({"":"x"})"), withValues(R"({"provider":"p1"})"),
        kHead + R"("objects":[)" + kObj + "}," + kObj + "}]}",
        withSubs(R"([{"name":"a","instance":""},{"name":"a","instance":""}])"),
        withSubs(R"([{"name":"","instance":""}])"), withSubs(R"([{"name":"a"}])"),
        withSubs(std::string(40, '[') + std::string(40, ']'))}) {
    EXPECT_FALSE(Import(text)) << text;
    ASSERT_EQ(errors_.size(), 1u) << text;
    EXPECT_EQ(ExportProviders(), before) << text;
  }
  Import(R"({"format":"orna-configstore-export","version":2,"objects":[]})");
  EXPECT_EQ(errors_[0].message, "version: unsupported version 2");
  Import(withValues(R"({"port":true})"));
  EXPECT_EQ(errors_[0].message,
            "objects[0].values.port: a value is a string, an integer or a list of strings");
}

TEST_F(ExportTest, KnownProviderValuesMustHaveTheirTypes) {
  auto provider = [](const std::string& values, const std::string& server) {
    return kHead + R"("objects":[)" + kObj + R"(,"values":{"provider":"p9")" + values +
           R"(},"subObjects":[{"name":"key_server","instance":"","subObjects":[)"
           R"({"name":"kmip_server","instance":"","subObjects":[)"
           R"({"name":"servers","instance":"s","values":)" +
           server + "}]}]}]}]}";
  };
  EXPECT_FALSE(Import(provider(R"(,"master_key_id":7)", "{}")));
  EXPECT_EQ(errors_[0].message, "providers/kms/orna/p9: \"master_key_id\" must be a string");
  EXPECT_FALSE(Import(provider("", R"({"port":"5696"})")));
  EXPECT_EQ(errors_[0].message,
            "providers/kms/orna/p9/key_server/kmip_server/servers[s]: \"port\" must be an integer");
  EXPECT_TRUE(Store().GetObjectsByFilter(ProvidersFilter()).empty());
  // Values the layout does not name are not checked.
  EXPECT_TRUE(Import(provider(R"(,"note":["x"])", R"({"port":5696,"weight":"high"})")));
}

}  // namespace
