#include <sys/stat.h>

#include <fstream>
#include <thread>

#include "tests/configstore/store_fixture.h"

namespace {

using namespace ZyrdTest;

SubObjectId Sub(const char* name) { return SubObjectId(name); }

TEST_F(StoreTest, ObjectsReachTheStoreWholeAndOnlyWhenWrittenOrUpdated) {
  auto p = SampleProvider("p1");
  EXPECT_THROW(Store().UpdateObject(p, 0), ConfigStoreException);  // not stored yet
  EXPECT_THROW(Store().WriteObject(p, 1), ConfigStoreException);   // unknown option
  EXPECT_EQ(Store().GetObject(ProviderId("p1")), nullptr);
  Store().WriteObject(p, 0);
  EXPECT_EQ(Codec::EncodeObject(*Store().GetObject(ProviderId("p1"))), Codec::EncodeObject(*p));

  auto kmip = p->GetSubObject(Sub("key_server"))->GetSubObject(Sub("kmip_server"));
  kmip->SetValue("credential", std::string("secret"));
  std::string credential;
  auto stored = [&] {
    return Store()
        .GetObject(ProviderId("p1"))
        ->GetSubObject(Sub("key_server"))
        ->GetSubObject(Sub("kmip_server"));
  };
  EXPECT_FALSE(stored()->GetValue("credential", &credential));
  Store().UpdateObject(p, 0);
  EXPECT_TRUE(stored()->GetValue("credential", &credential));
  EXPECT_EQ(credential, "secret");

  EXPECT_TRUE(Store().DeleteObject(ProviderId("p1")));
  EXPECT_FALSE(Store().DeleteObject(ProviderId("p1")));
  EXPECT_THROW(Store().UpdateObject(p, 0), ConfigStoreException);  // deleted meanwhile
  EXPECT_EQ(Store().GetObject(ProviderId("p1")), nullptr);
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
  EXPECT_EQ(Store().GetDesiredUserConfigInstances(ProviderId(""), 0).size(), 3u);
  EXPECT_THROW(Store().GetObject(ConfigStoreObjectId("providers", "kms", "")),
               ConfigStoreException);
}

TEST_F(StoreTest, DatabaseIsPrivateDurableAndSharedBetweenConcurrentConnections) {
  // A change that returned has reached the disk; a deleted one is overwritten.
  const auto durability = Store().ReadDurability();
  EXPECT_EQ(durability.journalMode, "wal");
  EXPECT_EQ(durability.synchronous, 2);  // FULL
  EXPECT_TRUE(durability.secureDelete);
  struct stat st;
  ASSERT_EQ(stat(DbPath().c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0600u);
  ASSERT_EQ(stat((dir_ / "lib/zyrd").c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0700u);

  // Two connections (as the daemon and cfgvault) write at once; the busy
  // timeout makes each wait for the other instead of failing.
  auto other = SqliteConfigStore::Open(DbPath());
  auto writer = [](SqliteConfigStore* store, const std::string& prefix) {
    for (int i = 0; i < 20; ++i) store->WriteObject(SampleProvider(prefix + std::to_string(i)), 0);
  };
  std::thread a(writer, store_.get(), "a");
  std::thread b(writer, other.get(), "b");
  a.join();
  b.join();
  store_.reset();
  other.reset();
  EXPECT_EQ(Store().GetObjectsByFilter(ProvidersFilter()).size(), 40u);
}

TEST_F(StoreTest, OpeningSomethingElseFailsClearly) {
  EXPECT_THROW(SqliteConfigStore::Open(""), ConfigStoreException);
  EXPECT_THROW(SqliteConfigStore::Open(dir_.Path()), ConfigStoreException);  // a directory
  std::ofstream(dir_ / "text.db") << "not a database, just text long enough to fill a header page";
  EXPECT_THROW(SqliteConfigStore::Open(dir_ / "text.db"), ConfigStoreException);
}

}  // namespace
