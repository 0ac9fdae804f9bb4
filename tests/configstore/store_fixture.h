// Helpers for tests of the store: a database in a scratch directory and a
// provider tree like the configuration layer writes.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "platform/configstore/export_codec.h"
#include "platform/configstore/sqlite_store.h"
#include "tests/support/temp_dir.h"

namespace ZyrdTest {

using namespace OrnaConfigStore;

inline ConfigStoreObjectId ProviderId(const std::string& name) {
  return ConfigStoreObjectId("providers", "kms", "orna", name);
}

inline FilterSpecObject ProvidersFilter() {
  return FilterSpecObject(ConfigStoreObjectId("providers", "kms", "orna"));
}

// A provider with a key server, a proxy and two servers, in that order.
inline ConfigStoreObjectPtr SampleProvider(const std::string& name, long generation = 1) {
  auto p = std::make_shared<ConfigStoreObject>(ProviderId(name));
  p->SetValue("master_key_id", "mk-" + name + "-" + std::to_string(generation));
  auto ks = p->CreateSubObject(SubObjectId("key_server"));
  ks->SetValue("type", std::string("KMIP"));
  ks->SetValue("connection_timeout", generation);
  ks->SetValue("server_cert", std::vector<std::string>{"cert-a", "cert-b"});
  auto proxy = ks->CreateSubObject(SubObjectId("proxy_server"));
  proxy->SetValue("hostname", std::string("proxy.example"));
  proxy->SetValue("port", generation);
  auto kmip = ks->CreateSubObject(SubObjectId("kmip_server"));
  kmip->SetValue("username", std::string("user"));
  for (const char* server : {"zeta", "alpha"}) {
    auto s = kmip->CreateSubObject(SubObjectId("servers", server));
    s->SetValue("name", std::string(server));
    s->SetValue("port", generation);
  }
  return p;
}

class StoreTest : public ::testing::Test {
 protected:
  std::string DbPath() const { return dir_ / "lib/zyrd/configstore.db"; }
  SqliteConfigStore& Store() {
    if (!store_) store_ = SqliteConfigStore::Open(DbPath());
    return *store_;
  }
  std::string ExportProviders() { return Store().Export({ProvidersFilter()}); }

  TempDir dir_;
  std::shared_ptr<SqliteConfigStore> store_;
};

}  // namespace ZyrdTest
