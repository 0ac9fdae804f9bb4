// The configuration store kept in one SQLite database file.
//
// Durability: the database runs in WAL mode with synchronous=FULL, so a
// change that returned has reached the disk and a crash (of the process or
// the host) at any moment leaves every object either as it was before a
// change or as it was after it. Each object is one row holding its whole
// tree, and every change is one transaction. Deleted rows are overwritten
// (secure_delete), since objects hold credentials and private keys.
//
// Several processes (the daemon and the cfgvault tool) may use one file at
// once: a connection waits up to its busy timeout for another's write lock.
// Missing directories of the path are created 0700 and the file 0600 (an
// existing file of ours that others could read is made 0600).
//
// One instance serialises its callers with a mutex; it is thread-safe.
#pragma once

#include <chrono>
#include <memory>
#include <mutex>
#include <string>

#include "platform/configstore/config_store.h"

struct sqlite3;

namespace OrnaConfigStore {

class SqliteConfigStore final : public ConfigStore {
 public:
  static constexpr std::chrono::milliseconds kDefaultBusyTimeout{10000};

  // Opens the database at `path`, creating it (and its directories) when
  // missing. Throws ConfigStoreException when it cannot, or when the file
  // is not a store database of a version this program knows.
  static std::shared_ptr<SqliteConfigStore> Open(
      const std::string& path, std::chrono::milliseconds busyTimeout = kDefaultBusyTimeout);

  ~SqliteConfigStore() override;
  SqliteConfigStore(const SqliteConfigStore&) = delete;
  SqliteConfigStore& operator=(const SqliteConfigStore&) = delete;

  const std::string& Path() const { return path_; }

  // The connection's durability settings as SQLite reports them.
  struct Durability {
    std::string journalMode;  // "wal"
    int synchronous = 0;      // 2 = FULL
    bool secureDelete = false;
  };
  Durability ReadDurability();

  ConfigStoreObjectPtr GetObject(const ConfigStoreObjectId& id) override;
  void WriteObject(const ConfigStoreObjectPtr& object, int options) override;
  void UpdateObject(const ConfigStoreObjectPtr& object, int options) override;
  bool DeleteObject(const ConfigStoreObjectId& id) override;
  std::vector<ConfigStoreObjectPtr> GetObjectsByFilter(const FilterSpecObject& filter) override;
  std::string Export(const std::vector<FilterSpecObject>& filters) override;
  bool Import(const std::string& text, std::vector<ErrorInfo>& errors) override;
  std::vector<ConfigStoreObjectPtr> GetDesiredUserConfigInstances(const ConfigStoreObjectId& id,
                                                                  int flags) override;
  void SetBootStatus(const ConfigStoreObjectId& id, bool restored) override;
  bool GetBootStatus(const ConfigStoreObjectId& id) override;

 private:
  SqliteConfigStore(sqlite3* db, std::string path) : db_(db), path_(std::move(path)) {}

  std::vector<ConfigStoreObjectPtr> SelectScope(const ConfigStoreObjectId& scope);
  void Store(const ConfigStoreObject& object, bool mustExist);

  std::mutex mutex_;  // serialises all use of db_
  sqlite3* db_;
  std::string path_;
};

}  // namespace OrnaConfigStore
