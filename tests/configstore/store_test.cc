#include <sys/stat.h>

#include <thread>

#include "tests/configstore/store_fixture.h"

namespace {

using namespace ZyrdTest;

TEST(StoreObject, ValuesAreTypedAndAbsentValuesLeaveTheOutput) {
  ConfigStoreObject o(ConfigStoreObjectId("k", "g", "c", "i"));
  o.SetValue("s", std::string("text"));
  o.SetValue("n", 42L);
  o.SetValue("l", std::vector<std::string>{"a", "b"});

  std::string s = "untouched";
  long n = -7;
  std::vector<std::string> l;
  EXPECT_TRUE(o.GetValue("s", &s));
  EXPECT_TRUE(o.GetValue("n", &n));
  EXPECT_TRUE(o.GetValue("l", &l));
  EXPECT_EQ(s, "text");
  EXPECT_EQ(n, 42);
  EXPECT_EQ(l, (std::vector<std::string>{"a", "b"}));

  std::string absent = "untouched";
  EXPECT_FALSE(o.GetValue("missing", &absent));
  EXPECT_EQ(absent, "untouched");

  EXPECT_THROW(o.GetValue("s", &n), ConfigStoreException);
  EXPECT_THROW(o.GetValue("n", &s), ConfigStoreException);
  EXPECT_THROW(o.GetValue("s", &l), ConfigStoreException);
  EXPECT_THROW(o.SetValue("", std::string("x")), ConfigStoreException);

  o.SetValue("s", 5L);  // a set replaces whatever type was there
  EXPECT_TRUE(o.GetValue("s", &n));
  EXPECT_EQ(n, 5);
}

TEST(StoreObject, SubObjectsKeepCreationOrderAndRefuseDuplicates) {
  ConfigStoreObject o(ConfigStoreObjectId("k", "g", "c"));
  for (const char* name : {"s3", "s1", "s2"}) o.CreateSubObject(SubObjectId("servers", name));
  o.CreateSubObject(SubObjectId("alpha"));
  EXPECT_THROW(o.CreateSubObject(SubObjectId("servers", "s1")), ConfigStoreException);
  EXPECT_THROW(o.CreateSubObject(SubObjectId("")), ConfigStoreException);

  FilterSpecObject servers(
      ConfigStoreObjectId("servers", kEmptyString, kEmptyString, kEmptyString));
  std::vector<std::string> order;
  for (const auto& s : o.GetSubObjectInstances(servers)) {
    order.push_back(s->GetConfigStoreObjectId().GetInstanceId());
  }
  EXPECT_EQ(order, (std::vector<std::string>{"s3", "s1", "s2"}));
  EXPECT_EQ(o.GetAllSubObjects().front()->GetConfigStoreObjectId().GetKey(), "alpha");

  EXPECT_TRUE(o.DeleteSubObject(SubObjectId("servers", "s1")));
  EXPECT_FALSE(o.DeleteSubObject(SubObjectId("servers", "s1")));
  EXPECT_EQ(o.GetSubObject(SubObjectId("servers", "s1")), nullptr);
  EXPECT_EQ(o.DeleteSubObjectInstances(servers), 2u);
  EXPECT_TRUE(o.GetSubObjectInstances(servers).empty());
  EXPECT_NE(o.GetSubObject(SubObjectId("alpha")), nullptr);
}

TEST(StoreObject, ProvidersReportTheirInstanceAndIdsMustBeComplete) {
  ConfigStoreObject p(ProviderId("p1"));
  std::string provider;
  EXPECT_TRUE(p.GetValue("provider", &provider));
  EXPECT_EQ(provider, "p1");
  EXPECT_THROW(ConfigStoreObject(ConfigStoreObjectId("providers", "", "orna")),
               ConfigStoreException);
}

TEST_F(StoreTest, WriteThenGetGivesTheWholeTreeBack) {
  Store().WriteObject(SampleProvider("p1"), 0);
  auto back = Store().GetObject(ProviderId("p1"));
  ASSERT_NE(back, nullptr);
  EXPECT_EQ(Codec::EncodeObject(*back), Codec::EncodeObject(*SampleProvider("p1")));
  EXPECT_EQ(Store().GetObject(ProviderId("p2")), nullptr);
}

TEST_F(StoreTest, ChangesThroughSubObjectHandlesReachTheStoreOnlyWhenWritten) {
  Store().WriteObject(SampleProvider("p1"), 0);
  auto p = Store().GetObject(ProviderId("p1"));
  auto kmip = p->GetSubObject(SubObjectId("key_server"))->GetSubObject(SubObjectId("kmip_server"));
  kmip->SetValue("credential", std::string("secret"));

  std::string credential;
  auto stored = Store().GetObject(ProviderId("p1"));
  EXPECT_FALSE(stored->GetSubObject(SubObjectId("key_server"))
                   ->GetSubObject(SubObjectId("kmip_server"))
                   ->GetValue("credential", &credential));

  Store().UpdateObject(p, 0);
  stored = Store().GetObject(ProviderId("p1"));
  EXPECT_TRUE(stored->GetSubObject(SubObjectId("key_server"))
                  ->GetSubObject(SubObjectId("kmip_server"))
                  ->GetValue("credential", &credential));
  EXPECT_EQ(credential, "secret");
}

TEST_F(StoreTest, UpdateDeleteAndBadArgumentsChangeNothingWhenRefused) {
  auto p = SampleProvider("p1");
  EXPECT_THROW(Store().UpdateObject(p, 0), ConfigStoreException);  // not stored yet
  EXPECT_EQ(Store().GetObject(ProviderId("p1")), nullptr);
  EXPECT_THROW(Store().WriteObject(p, 1), ConfigStoreException);
  EXPECT_THROW(Store().WriteObject(nullptr, 0), ConfigStoreException);
  EXPECT_THROW(Store().GetObject(ConfigStoreObjectId("providers", "kms", "")),
               ConfigStoreException);
  EXPECT_EQ(Store().GetObject(ProviderId("p1")), nullptr);

  Store().WriteObject(p, 0);
  EXPECT_TRUE(Store().DeleteObject(ProviderId("p1")));
  EXPECT_FALSE(Store().DeleteObject(ProviderId("p1")));
  EXPECT_EQ(Store().GetObject(ProviderId("p1")), nullptr);
  EXPECT_THROW(Store().UpdateObject(p, 0), ConfigStoreException);  // deleted meanwhile
}

TEST_F(StoreTest, FilterGivesEveryInstanceOfTheKeyInInstanceOrder) {
  for (const char* name : {"p2", "p10", "p1"}) Store().WriteObject(SampleProvider(name), 0);
  Store().WriteObject(std::make_shared<ConfigStoreObject>(
                          ConfigStoreObjectId("certificate", "attestation", "orna")),
                      0);
  std::vector<std::string> instances;
  for (const auto& o : Store().GetObjectsByFilter(ProvidersFilter())) {
    instances.push_back(o->GetConfigStoreObjectId().GetInstanceId());
  }
  EXPECT_EQ(instances, (std::vector<std::string>{"p1", "p10", "p2"}));
  EXPECT_TRUE(
      Store().GetObjectsByFilter(FilterSpecObject(ConfigStoreObjectId("x", "y", "z"))).empty());
  EXPECT_EQ(Store().GetDesiredUserConfigInstances(ProviderId(""), 0).size(), 3u);
  EXPECT_THROW(Store().GetDesiredUserConfigInstances(ProviderId(""), 1), ConfigStoreException);
}

TEST_F(StoreTest, DatabaseIsPrivateDurableAndSharedBetweenConnections) {
  Store().WriteObject(SampleProvider("p1"), 0);
  struct stat st;
  ASSERT_EQ(stat(DbPath().c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0600u);
  ASSERT_EQ(stat(dir_.File("lib/zyrd").c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0700u);

  // A second connection (another process would do the same) sees the write
  // and its own writes are seen by the first.
  auto other = SqliteConfigStore::Open(DbPath());
  EXPECT_NE(other->GetObject(ProviderId("p1")), nullptr);
  other->WriteObject(SampleProvider("p2"), 0);
  EXPECT_NE(Store().GetObject(ProviderId("p2")), nullptr);

  store_.reset();
  other.reset();
  EXPECT_EQ(Store().GetObjectsByFilter(ProvidersFilter()).size(), 2u);
}

TEST_F(StoreTest, ConcurrentWritersOnTwoConnectionsAllSucceed) {
  Store();
  auto other = SqliteConfigStore::Open(DbPath());
  auto writer = [](SqliteConfigStore* store, const std::string& prefix) {
    for (int i = 0; i < 20; ++i) store->WriteObject(SampleProvider(prefix + std::to_string(i)), 0);
  };
  std::thread a(writer, store_.get(), "a");
  std::thread b(writer, other.get(), "b");
  a.join();
  b.join();
  EXPECT_EQ(Store().GetObjectsByFilter(ProvidersFilter()).size(), 40u);
}

TEST_F(StoreTest, BootStatusIsKeptPerInstanceEvenWithoutAnObject) {
  ConfigStoreObjectId zyrdConfig("zyrd_config", "kms", "orna");
  EXPECT_FALSE(Store().GetBootStatus(zyrdConfig));
  Store().SetBootStatus(zyrdConfig, true);
  EXPECT_TRUE(Store().GetBootStatus(zyrdConfig));
  EXPECT_FALSE(Store().GetBootStatus(ProviderId("p1")));
  Store().SetBootStatus(zyrdConfig, false);
  EXPECT_FALSE(Store().GetBootStatus(zyrdConfig));
}

TEST_F(StoreTest, OpeningSomethingElseFailsClearly) {
  EXPECT_THROW(SqliteConfigStore::Open(""), ConfigStoreException);
  EXPECT_THROW(SqliteConfigStore::Open(dir_.Path()), ConfigStoreException);  // a directory
  std::string notADatabase = dir_.File("text.db");
  FILE* f = fopen(notADatabase.c_str(), "w");
  fputs("this is not a database, just text that is long enough to fill a header page", f);
  fclose(f);
  EXPECT_THROW(SqliteConfigStore::Open(notADatabase), ConfigStoreException);
}

TEST_F(StoreTest, GlobalStoreCanBeReplacedAndOnlyTheGlobalNamespaceExists) {
  ConfigStore::SetGlobalStore(store_ = SqliteConfigStore::Open(DbPath()));
  EXPECT_EQ(ConfigStore::GetStore(sGlobalNamespace).get(), store_.get());
  EXPECT_THROW(ConfigStore::GetStore("other"), ConfigStoreException);
  ConfigStore::SetGlobalStore(nullptr);
}

}  // namespace
