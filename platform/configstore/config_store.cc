#include "platform/configstore/config_store.h"

#include <mutex>

#include "platform/configstore/sqlite_store.h"
#include "platform/util/paths.h"

namespace OrnaConfigStore {

const std::string sGlobalNamespace = "global";

namespace {

std::mutex gGlobalMutex;
std::shared_ptr<ConfigStore> gGlobalStore;  // guarded by gGlobalMutex

}  // namespace

std::shared_ptr<ConfigStore> ConfigStore::GetStore(const std::string& ns) {
  if (ns != sGlobalNamespace) throw ConfigStoreException("unknown store namespace '" + ns + "'");
  std::lock_guard<std::mutex> lock(gGlobalMutex);
  if (!gGlobalStore) gGlobalStore = SqliteConfigStore::Open(DefaultStorePath());
  return gGlobalStore;
}

void ConfigStore::SetGlobalStore(std::shared_ptr<ConfigStore> store) {
  std::lock_guard<std::mutex> lock(gGlobalMutex);
  gGlobalStore = std::move(store);
}

std::string DefaultStorePath() { return Groundwork::RootPath("/var/lib/zyrd/configstore.db"); }

}  // namespace OrnaConfigStore
