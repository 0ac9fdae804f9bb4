#include "platform/configstore/sqlite_store.h"

#include <fcntl.h>
#include <openssl/crypto.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>

#include "platform/configstore/export_codec.h"
#include "platform/configstore/record_types.h"

namespace OrnaConfigStore {
namespace {

constexpr int kSchemaVersion = 1;

constexpr const char* kSchema =
    "CREATE TABLE objects ("
    " obj_key TEXT NOT NULL, obj_group TEXT NOT NULL, obj_component TEXT NOT NULL,"
    " obj_instance TEXT NOT NULL, body TEXT NOT NULL,"
    " PRIMARY KEY (obj_key, obj_group, obj_component, obj_instance)) WITHOUT ROWID;"
    "CREATE TABLE boot_status ("
    " obj_key TEXT NOT NULL, obj_group TEXT NOT NULL, obj_component TEXT NOT NULL,"
    " obj_instance TEXT NOT NULL, boot_id TEXT NOT NULL,"
    " PRIMARY KEY (obj_key, obj_group, obj_component, obj_instance)) WITHOUT ROWID;"
    "PRAGMA user_version = 1;";

constexpr const char* kIdMatch =
    " WHERE obj_key = ?1 AND obj_group = ?2 AND obj_component = ?3 AND obj_instance = ?4";
constexpr const char* kScopeMatch = " WHERE obj_key = ?1 AND obj_group = ?2 AND obj_component = ?3";

[[noreturn]] void ThrowSqlite(sqlite3* db, const std::string& what) {
  throw ConfigStoreException(what + ": " + (db ? sqlite3_errmsg(db) : "out of memory"));
}

[[noreturn]] void ThrowErrno(const std::string& what, const std::string& path) {
  throw ConfigStoreException(what + " " + path + ": " + std::strerror(errno));
}

void Exec(sqlite3* db, const char* sql) {
  if (sqlite3_exec(db, sql, nullptr, nullptr, nullptr) != SQLITE_OK) ThrowSqlite(db, sql);
}

class Statement {
 public:
  Statement(sqlite3* db, const std::string& sql) : db_(db) {
    if (sqlite3_prepare_v2(db, sql.c_str(), -1, &stmt_, nullptr) != SQLITE_OK) {
      ThrowSqlite(db, "preparing a statement");
    }
  }
  ~Statement() { sqlite3_finalize(stmt_); }
  Statement(const Statement&) = delete;
  Statement& operator=(const Statement&) = delete;

  Statement& Bind(int index, std::string_view text) {
    if (sqlite3_bind_text(stmt_, index, text.data(), static_cast<int>(text.size()),
                          SQLITE_TRANSIENT) != SQLITE_OK) {
      ThrowSqlite(db_, "binding a value");
    }
    return *this;
  }
  // Binds key, group, component (1-3) and, when `withInstance`, instance (4).
  Statement& BindId(const ConfigStoreObjectId& id, bool withInstance) {
    Bind(1, id.GetKey()).Bind(2, id.GetGroup()).Bind(3, id.GetComponent());
    return withInstance ? Bind(4, id.GetInstanceId()) : *this;
  }
  // True while there is a row to read.
  bool Step() {
    int rc = sqlite3_step(stmt_);
    if (rc == SQLITE_ROW) return true;
    if (rc != SQLITE_DONE) ThrowSqlite(db_, "reading or writing the store");
    return false;
  }
  std::string_view Text(int column) {
    const auto* p = reinterpret_cast<const char*>(sqlite3_column_text(stmt_, column));
    return p ? std::string_view(p, static_cast<size_t>(sqlite3_column_bytes(stmt_, column)))
             : std::string_view();
  }
  int Int(int column) { return sqlite3_column_int(stmt_, column); }

 private:
  sqlite3* db_;
  sqlite3_stmt* stmt_ = nullptr;
};

// One transaction; rolled back unless committed. Writers take the write lock
// at the start (IMMEDIATE), so the busy timeout covers the whole wait.
class Transaction {
 public:
  Transaction(sqlite3* db, bool write) : db_(db) { Exec(db, write ? "BEGIN IMMEDIATE" : "BEGIN"); }
  ~Transaction() {
    if (!done_) sqlite3_exec(db_, "ROLLBACK", nullptr, nullptr, nullptr);
  }
  void Commit() {
    Exec(db_, "COMMIT");
    done_ = true;
  }

 private:
  sqlite3* db_;
  bool done_ = false;
};

// Creates the missing directories of `path`'s parent: the last one 0700,
// those above it 0755. Existing directories are left as they are.
void MakeParentDirectories(const std::string& path) {
  size_t last = path.rfind('/');
  if (last == std::string::npos || last == 0) return;
  std::string parent = path.substr(0, last);
  for (size_t pos = 1; pos <= parent.size(); ++pos) {
    if (pos != parent.size() && parent[pos] != '/') continue;
    std::string prefix = parent.substr(0, pos);
    if (mkdir(prefix.c_str(), pos == parent.size() ? 0700 : 0755) != 0 && errno != EEXIST) {
      ThrowErrno("cannot create directory", prefix);
    }
  }
}

// Creates the file 0600 before SQLite does (SQLite would use 0644); its
// journal files take the same mode.
void PrepareFile(const std::string& path) {
  int fd = open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  if (fd < 0) ThrowErrno("cannot open", path);
  struct stat st;
  if (fstat(fd, &st) == 0 && (st.st_mode & 077) != 0 && st.st_uid == geteuid()) {
    fchmod(fd, 0600);
  }
  close(fd);
}

void InitSchema(sqlite3* db) {
  Transaction txn(db, true);
  int current = 0;
  {
    Statement version(db, "PRAGMA user_version");
    if (version.Step()) current = version.Int(0);
  }
  if (current == 0) {
    Exec(db, kSchema);
  } else if (current != kSchemaVersion) {
    throw ConfigStoreException("unsupported store schema version " + std::to_string(current));
  }
  txn.Commit();
}

const std::string& BootId() {
  static const std::string id = [] {
    std::ifstream in("/proc/sys/kernel/random/boot_id");
    std::string line;
    std::getline(in, line);
    return line.empty() ? std::string("unknown") : line;
  }();
  return id;
}

void CheckTopLevelId(const ConfigStoreObjectId& id) {
  if (id.GetKey().empty() || id.GetGroup().empty() || id.GetComponent().empty()) {
    throw ConfigStoreException("incomplete object id " + id.ToString());
  }
}

void CheckOptions(int options) {
  if (options != 0) throw ConfigStoreException("unsupported option " + std::to_string(options));
}

ConfigStoreObjectPtr Decode(const ConfigStoreObjectId& id, std::string_view body) {
  auto object = std::make_shared<ConfigStoreObject>(id);
  Codec::DecodeBody(body, *object);
  return object;
}

bool Exists(sqlite3* db, const ConfigStoreObjectId& id) {
  Statement select(db, std::string("SELECT 1 FROM objects") + kIdMatch);
  return select.BindId(id, true).Step();
}

void Insert(sqlite3* db, const ConfigStoreObject& object, const char* verb) {
  std::string body = Codec::EncodeBody(object);
  Groundwork::WipeOnExit wipe(body);
  Statement insert(db, std::string(verb) +
                           " INTO objects (obj_key, obj_group, obj_component, obj_instance, body)"
                           " VALUES (?1, ?2, ?3, ?4, ?5)");
  insert.BindId(object.GetConfigStoreObjectId(), true).Bind(5, body).Step();
}

}  // namespace

std::shared_ptr<SqliteConfigStore> SqliteConfigStore::Open(const std::string& path,
                                                           std::chrono::milliseconds busyTimeout) {
  if (path.empty()) throw ConfigStoreException("empty store path");
  MakeParentDirectories(path);
  PrepareFile(path);
  sqlite3* db = nullptr;
  int rc = sqlite3_open_v2(path.c_str(), &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX, nullptr);
  // From here the store owns the handle and closes it on every path.
  std::shared_ptr<SqliteConfigStore> store(new SqliteConfigStore(db, path));
  if (rc != SQLITE_OK) ThrowSqlite(db, "cannot open " + path);
  sqlite3_busy_timeout(db, static_cast<int>(busyTimeout.count()));
  sqlite3_extended_result_codes(db, 1);

  {
    Statement journal(db, "PRAGMA journal_mode = WAL");
    if (!journal.Step() || journal.Text(0) != "wal") {
      throw ConfigStoreException("cannot use write-ahead logging for " + path);
    }
  }
  Exec(db, "PRAGMA synchronous = FULL; PRAGMA secure_delete = ON");
  InitSchema(db);
  return store;
}

SqliteConfigStore::~SqliteConfigStore() { sqlite3_close_v2(db_); }

SqliteConfigStore::Durability SqliteConfigStore::ReadDurability() {
  std::lock_guard<std::mutex> lock(mutex_);
  Durability d;
  Statement journal(db_, "PRAGMA journal_mode");
  if (journal.Step()) d.journalMode = std::string(journal.Text(0));
  Statement synchronous(db_, "PRAGMA synchronous");
  if (synchronous.Step()) d.synchronous = synchronous.Int(0);
  Statement secureDelete(db_, "PRAGMA secure_delete");
  if (secureDelete.Step()) d.secureDelete = secureDelete.Int(0) != 0;
  return d;
}

ConfigStoreObjectPtr SqliteConfigStore::GetObject(const ConfigStoreObjectId& id) {
  CheckTopLevelId(id);
  std::lock_guard<std::mutex> lock(mutex_);
  Statement select(db_, std::string("SELECT body FROM objects") + kIdMatch);
  select.BindId(id, true);
  return select.Step() ? Decode(id, select.Text(0)) : nullptr;
}

void SqliteConfigStore::Store(const ConfigStoreObject& object, bool mustExist) {
  const auto& id = object.GetConfigStoreObjectId();
  CheckTopLevelId(id);
  std::lock_guard<std::mutex> lock(mutex_);
  Transaction txn(db_, true);
  if (mustExist && !Exists(db_, id)) {
    throw ConfigStoreException("object " + id.ToString() + " does not exist");
  }
  Insert(db_, object, "INSERT OR REPLACE");
  txn.Commit();
}

void SqliteConfigStore::WriteObject(const ConfigStoreObjectPtr& object, int options) {
  CheckOptions(options);
  if (!object) throw ConfigStoreException("no object to write");
  Store(*object, false);
}

void SqliteConfigStore::UpdateObject(const ConfigStoreObjectPtr& object, int options) {
  CheckOptions(options);
  if (!object) throw ConfigStoreException("no object to update");
  Store(*object, true);
}

bool SqliteConfigStore::DeleteObject(const ConfigStoreObjectId& id) {
  CheckTopLevelId(id);
  std::lock_guard<std::mutex> lock(mutex_);
  Transaction txn(db_, true);
  Statement remove(db_, std::string("DELETE FROM objects") + kIdMatch);
  remove.BindId(id, true).Step();
  bool removed = sqlite3_changes(db_) > 0;
  txn.Commit();
  return removed;
}

std::vector<ConfigStoreObjectPtr> SqliteConfigStore::SelectScope(const ConfigStoreObjectId& scope) {
  CheckTopLevelId(scope);
  Statement select(db_, std::string("SELECT obj_instance, body FROM objects") + kScopeMatch +
                            " ORDER BY obj_instance");
  select.BindId(scope, false);
  std::vector<ConfigStoreObjectPtr> objects;
  while (select.Step()) {
    ConfigStoreObjectId id = scope;
    id.SetInstanceId(std::string(select.Text(0)));
    objects.push_back(Decode(id, select.Text(1)));
  }
  return objects;
}

std::vector<ConfigStoreObjectPtr> SqliteConfigStore::GetObjectsByFilter(
    const FilterSpecObject& filter) {
  std::lock_guard<std::mutex> lock(mutex_);
  return SelectScope(filter.GetConfigStoreObjectId());
}

std::string SqliteConfigStore::Export(const std::vector<FilterSpecObject>& filters) {
  std::vector<ConfigStoreObjectId> scopes;
  std::vector<ConfigStoreObjectPtr> objects;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    Transaction snapshot(db_, false);  // one consistent view across the filters
    for (const auto& filter : filters) {
      const auto& scope = filter.GetConfigStoreObjectId();
      if (std::find_if(scopes.begin(), scopes.end(),
                       [&](const auto& s) { return s.SameScope(scope); }) != scopes.end()) {
        continue;
      }
      auto selected = SelectScope(scope);
      scopes.push_back(scope);
      objects.insert(objects.end(), selected.begin(), selected.end());
    }
    snapshot.Commit();
  }
  return Codec::EncodeExport(scopes, std::move(objects));
}

bool SqliteConfigStore::Import(const std::string& text, std::vector<ErrorInfo>& errors) {
  Codec::ExportContents contents;
  std::string error;
  if (!Codec::DecodeExport(text, contents, error) || !CheckRecordTypes(contents.objects, error)) {
    errors.push_back({std::move(error)});
    return false;
  }
  std::lock_guard<std::mutex> lock(mutex_);
  Transaction txn(db_, true);
  for (const auto& scope : contents.scopes) {
    Statement remove(db_, std::string("DELETE FROM objects") + kScopeMatch);
    remove.BindId(scope, false).Step();
  }
  for (const auto& object : contents.objects) Insert(db_, *object, "INSERT");
  txn.Commit();
  return true;
}

std::vector<ConfigStoreObjectPtr> SqliteConfigStore::GetDesiredUserConfigInstances(
    const ConfigStoreObjectId& id, int flags) {
  CheckOptions(flags);
  std::lock_guard<std::mutex> lock(mutex_);
  return SelectScope(id);
}

void SqliteConfigStore::SetBootStatus(const ConfigStoreObjectId& id, bool restored) {
  CheckTopLevelId(id);
  std::lock_guard<std::mutex> lock(mutex_);
  if (restored) {
    Statement mark(db_,
                   "INSERT OR REPLACE INTO boot_status"
                   " (obj_key, obj_group, obj_component, obj_instance, boot_id)"
                   " VALUES (?1, ?2, ?3, ?4, ?5)");
    mark.BindId(id, true).Bind(5, BootId()).Step();
  } else {
    Statement unmark(db_, std::string("DELETE FROM boot_status") + kIdMatch);
    unmark.BindId(id, true).Step();
  }
}

bool SqliteConfigStore::GetBootStatus(const ConfigStoreObjectId& id) {
  CheckTopLevelId(id);
  std::lock_guard<std::mutex> lock(mutex_);
  Statement select(db_, std::string("SELECT boot_id FROM boot_status") + kIdMatch);
  return select.BindId(id, true).Step() && select.Text(0) == BootId();
}

}  // namespace OrnaConfigStore
