
#include "tests/configstore/store_fixture.h"

namespace {

using namespace ZyrdTest;

constexpr const char* kHead = R"({"format":"orna-configstore-export","version":1,)";
constexpr const char* kProvidersScope =
    R"("scope":[{"key":"providers","group":"kms","component":"orna"}],)";

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
            std::string(kHead) + kProvidersScope +
                R"("objects":[{"key":"providers","group":"kms","component":"orna","instance":"p1",)"
                R"("values":{"master_key_id":"k1","provider":"p1"},)"
                R"("subObjects":[{"name":"key_server","instance":"",)"
                R"("values":{"connection_timeout":-1,"server_cert":["c\"1\n","c2"],"type":"KMIP"},)"
                R"("subObjects":[{"name":"kmip_server","instance":"","values":{"username":"u"},)"
                R"("subObjects":[]}]}]}]})");
}

TEST_F(ExportTest, EqualContentsGiveEqualTextsWhateverTheOrderOfWriting) {
  auto a = std::make_shared<ConfigStoreObject>(ProviderId("p1"));
  a->SetValue("b", 1L);
  a->SetValue("a", 2L);
  a->CreateSubObject(SubObjectId("y"));
  a->CreateSubObject(SubObjectId("x"));
  auto b = std::make_shared<ConfigStoreObject>(ProviderId("p1"));
  b->CreateSubObject(SubObjectId("x"));
  b->CreateSubObject(SubObjectId("y"));
  b->SetValue("a", 2L);
  b->SetValue("b", 1L);
  EXPECT_EQ(Codec::EncodeObject(*a), Codec::EncodeObject(*b));

  Store().WriteObject(SampleProvider("p2"), 0);
  Store().WriteObject(SampleProvider("p1"), 0);
  std::string first = ExportProviders();
  Store().DeleteObject(ProviderId("p2"));
  Store().WriteObject(SampleProvider("p2"), 0);
  EXPECT_EQ(ExportProviders(), first);
}

TEST_F(ExportTest, ImportOfAnExportGivesTheSameTextBackAndKeepsServerOrder) {
  Store().WriteObject(SampleProvider("p1"), 0);
  Store().WriteObject(SampleProvider("p2", 7), 0);
  std::string text = ExportProviders();
  EXPECT_LT(text.find(R"("instance":"zeta")"), text.find(R"("instance":"alpha")"));

  TempDir otherDir;
  auto other = SqliteConfigStore::Open(otherDir.File("c.db"));
  std::vector<ErrorInfo> errors;
  ASSERT_TRUE(other->Import(text, errors));
  EXPECT_EQ(other->Export({ProvidersFilter()}), text);
  ASSERT_TRUE(other->Import(text + "\n", errors));  // trailing white space is fine
  EXPECT_EQ(other->Export({ProvidersFilter()}), text);
}

TEST_F(ExportTest, ImportReplacesTheCoveredKeysOnly) {
  Store().WriteObject(SampleProvider("old"), 0);
  auto cert = std::make_shared<ConfigStoreObject>(
      ConfigStoreObjectId("certificate", "attestation", "orna"));
  cert->SetValue("certificate", std::string("pem"));
  Store().WriteObject(cert, 0);

  // An export of an empty scope empties it.
  ASSERT_TRUE(Import(std::string(kHead) + kProvidersScope + R"("objects":[]})"));
  EXPECT_TRUE(Store().GetObjectsByFilter(ProvidersFilter()).empty());
  EXPECT_NE(Store().GetObject(cert->GetConfigStoreObjectId()), nullptr);

  // Without "scope" a text covers the keys of its objects.
  Store().WriteObject(SampleProvider("old"), 0);
  ASSERT_TRUE(Import(std::string(kHead) +
                     R"("objects":[{"key":"providers","group":"kms","component":"orna",)"
                     R"("instance":"new","values":{"master_key_id":"k"}}]})"));
  auto all = Store().GetObjectsByFilter(ProvidersFilter());
  ASSERT_EQ(all.size(), 1u);
  EXPECT_EQ(all[0]->GetConfigStoreObjectId().GetInstanceId(), "new");
  ASSERT_TRUE(Import(std::string(kHead) + R"("objects":[]})"));
  EXPECT_EQ(Store().GetObjectsByFilter(ProvidersFilter()).size(), 1u);
  EXPECT_NE(Store().GetObject(cert->GetConfigStoreObjectId()), nullptr);
}

TEST_F(ExportTest, NumbersAndListsKeepTheirTypes) {
  ASSERT_TRUE(Import(std::string(kHead) +
                     R"("objects":[{"key":"k","group":"g","component":"c","instance":"",)"
                     R"("values":{"min":-9223372036854775808,"max":9223372036854775807,)"
                     R"("empty":[],"s":"5"}}]})"));
  auto o = Store().GetObject(ConfigStoreObjectId("k", "g", "c"));
  ASSERT_NE(o, nullptr);
  long n = 0;
  EXPECT_TRUE(o->GetValue("min", &n));
  EXPECT_EQ(n, LONG_MIN);
  EXPECT_TRUE(o->GetValue("max", &n));
  EXPECT_EQ(n, LONG_MAX);
  std::vector<std::string> list{"x"};
  EXPECT_TRUE(o->GetValue("empty", &list));
  EXPECT_TRUE(list.empty());
  EXPECT_THROW(o->GetValue("s", &n), ConfigStoreException);
}

TEST_F(ExportTest, RefusedTextsChangeNothingAndSayWhy) {
  Store().WriteObject(SampleProvider("p1"), 0);
  const std::string before = ExportProviders();
  const std::string obj = R"({"key":"providers","group":"kms","component":"orna","instance":"p9")";
  const std::string bad[] = {
      "",
      "not json",
      before.substr(0, before.size() - 1),
      before + "x",
      "[]",
      R"({"format":"other","version":1,"objects":[]})",
      R"({"format":"orna-configstore-export","version":2,"objects":[]})",
      R"({"format":"orna-configstore-export","version":"1","objects":[]})",
      R"({"format":"orna-configstore-export","objects":[]})",
      R"({"format":"orna-configstore-export","version":1})",
      R"({"format":"orna-configstore-export","version":1,"objects":[],"extra":0})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"port":1.5}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"port":true}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"port":null}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"port":18446744073709551615}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"l":["a",1]}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"o":{}}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"":"x"}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"provider":"p1"}}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"provider":1}}]})",
      std::string(kHead) + R"("objects":[)" + obj + "}," + obj + "}]}",
      std::string(kHead) + R"("objects":[)" + obj +
          R"(,"subObjects":[{"name":"a","instance":""},)" + R"({"name":"a","instance":""}]}]})",
      std::string(kHead) + R"("objects":[)" + obj +
          R"(,"subObjects":[{"name":"","instance":""}]}]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"subObjects":[{"name":"a"}]}]})",
      std::string(kHead) + R"("objects":[)" + obj +
          R"(,"subObjects":[{"name":"a","instance":"","x":1}]}]})",
      std::string(kHead) +
          R"("objects":[{"key":"providers","group":"","component":"orna","instance":""}]})",
      std::string(kHead) + R"("scope":[{"key":"providers","group":"kms"}],"objects":[]})",
      std::string(kHead) + R"("objects":[)" + obj + R"(,"subObjects":)" + std::string(40, '[') +
          std::string(40, ']') + "}]}",
  };
  for (const auto& text : bad) {
    EXPECT_FALSE(Import(text)) << text;
    ASSERT_EQ(errors_.size(), 1u) << text;
    EXPECT_FALSE(errors_[0].message.empty());
    EXPECT_EQ(ExportProviders(), before) << text;
  }
  Import(R"({"format":"orna-configstore-export","version":2,"objects":[]})");
  EXPECT_EQ(errors_[0].message, "version: unsupported version 2");
  Import(std::string(kHead) + R"("objects":[)" + obj + R"(,"values":{"port":true}}]})");
  EXPECT_EQ(errors_[0].message,
            "objects[0].values.port: a value is a string, an integer or a list of strings");
}

TEST_F(ExportTest, StoredObjectsThatAreCorruptFailClearly) {
  OrnaConfigStore::ConfigStoreObject o(ProviderId("p1"));
  EXPECT_THROW(Codec::DecodeBody(R"({"values":{"x":1.5}})", o), ConfigStoreException);
  EXPECT_THROW(Codec::DecodeBody("garbage", o), ConfigStoreException);
}

}  // namespace
