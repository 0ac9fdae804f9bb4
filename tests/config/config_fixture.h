// A configuration layer running on a scratch database, with a switch to
// make chosen store operations throw.
#pragma once

#include <gtest/gtest.h>

#include <set>
#include <string>

#include "config/provider_config.h"
#include "daemon/logger.h"
#include "platform/configstore/sqlite_store.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace ZyrdTest {

using namespace OrnaConfigStore;

inline constexpr const char* kInjected = "injected failure";

// Forwards to a real store, except that the operations named with FailOn
// throw ConfigStoreException(kInjected).
class ThrowingStore : public ConfigStore {
 public:
  enum Op { kGet, kWrite, kUpdate, kDelete, kFilter, kExport, kImport, kDesired, kBootStatus };

  explicit ThrowingStore(std::shared_ptr<ConfigStore> real) : real_(std::move(real)) {}
  void FailOn(Op op) { failing_.insert(op); }

  template <typename Call>
  auto Run(Op op, Call call) {
    if (failing_.count(op) != 0) throw ConfigStoreException(kInjected);
    return call();
  }

  ConfigStoreObjectPtr GetObject(const ConfigStoreObjectId& id) override {
    return Run(kGet, [&] { return real_->GetObject(id); });
  }
  void WriteObject(const ConfigStoreObjectPtr& o, int options) override {
    Run(kWrite, [&] { real_->WriteObject(o, options); });
  }
  void UpdateObject(const ConfigStoreObjectPtr& o, int options) override {
    Run(kUpdate, [&] { real_->UpdateObject(o, options); });
  }
  bool DeleteObject(const ConfigStoreObjectId& id) override {
    return Run(kDelete, [&] { return real_->DeleteObject(id); });
  }
  std::vector<ConfigStoreObjectPtr> GetObjectsByFilter(const FilterSpecObject& f) override {
    return Run(kFilter, [&] { return real_->GetObjectsByFilter(f); });
  }
  std::string Export(const std::vector<FilterSpecObject>& filters) override {
    return Run(kExport, [&] { return real_->Export(filters); });
  }
  bool Import(const std::string& text, std::vector<ErrorInfo>& errors) override {
    return Run(kImport, [&] { return real_->Import(text, errors); });
  }
  std::vector<ConfigStoreObjectPtr> GetDesiredUserConfigInstances(const ConfigStoreObjectId& id,
                                                                  int flags) override {
    return Run(kDesired, [&] { return real_->GetDesiredUserConfigInstances(id, flags); });
  }
  void SetBootStatus(const ConfigStoreObjectId& id, bool restored) override {
    Run(kBootStatus, [&] { real_->SetBootStatus(id, restored); });
  }
  bool GetBootStatus(const ConfigStoreObjectId& id) override { return real_->GetBootStatus(id); }

 private:
  std::shared_ptr<ConfigStore> real_;
  std::set<Op> failing_;
};

class ConfigTest : public ::testing::Test {
 protected:
  void SetUp() override {
    real_ = SqliteConfigStore::Open(dir_ / "configstore.db");
    store_ = std::make_shared<ThrowingStore>(real_);
    ConfigStore::SetGlobalStore(store_);
    Zyrd::ZyrApi::GetDaemonLogger()->SetLevel(5);
  }
  void TearDown() override { ConfigStore::SetGlobalStore(nullptr); }

  // A provider as the providers service creates one: description, timeout
  // 30, optionally a proxy, user "alice", servers s2 then s1.
  void CreateProvider(const std::string& name, bool withProxy = true) {
    using namespace Zyrd::Config;
    ProviderConfigObjects o;
    o.name = name;
    // Evaluated in order, as written.
    for (int status :
         {CreateProviderObjects(o), SetMasterKeyId(o, "mk-" + name), SetDescription(o, "desc"),
          SetConnectionTimeout(o, 30), withProxy ? SetProxy(o, "proxy.example", 3128) : 0,
          SetType(o, "KMIP"), SetUserName(o, "alice"), AddServer(o, "s2", "kms2.example", 5696),
          AddServer(o, "s1", "kms1.example", 5697), WriteProvider(o)}) {
      ASSERT_EQ(status, 0);
    }
  }

  // Changes the stored provider directly in the store.
  template <typename Change>
  void Tamper(const std::string& name, Change change) {
    Zyrd::Config::ProviderConfigObjects o;
    ASSERT_EQ(Zyrd::Config::GetProviderObjects(name, o), 0);
    change(o);
    real_->WriteObject(o.provider, 0);
  }

  // The error line about an injected exception and the daemon logger's copy
  // of its text.
  void ExpectInjected(const std::string& prefix) {
    EXPECT_TRUE(log_.Has(2, prefix + kInjected + "\n")) << prefix;
    EXPECT_TRUE(log_.Has(3, std::string("zyrdLogger: ") + kInjected + "\n"));
  }

  std::string ExportAll() {
    return real_->Export({FilterSpecObject(ConfigStoreObjectId("providers", "kms", "orna"))});
  }

  TempDir dir_;
  LogCapture log_{7};
  std::shared_ptr<SqliteConfigStore> real_;
  std::shared_ptr<ThrowingStore> store_;
};

}  // namespace ZyrdTest
