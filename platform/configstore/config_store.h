// The host configuration store: durable top-level objects (see
// store_object.h), read and written whole.
//
// ConfigStore is the interface the daemon's configuration layer calls; the
// real implementation keeps the objects in SQLite (sqlite_store.h). Every
// operation is thread-safe and atomic: a write, update, delete or import is
// one transaction, so a reader (in this process or another) sees an object
// either before or after a change, never half of it. Every failure is a
// ConfigStoreException.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/configstore/store_object.h"

namespace OrnaConfigStore {

// The namespace of the host's one store.
extern const std::string sGlobalNamespace;

// Why an import was refused.
struct ErrorInfo {
  std::string message;
};

class ConfigStore {
 public:
  virtual ~ConfigStore() = default;

  // The store of namespace `ns` (only sGlobalNamespace exists): the store
  // installed with SetGlobalStore, otherwise the database at
  // DefaultStorePath(), opened on first use. Throws ConfigStoreException for
  // another namespace or when the database cannot be opened (a later call
  // tries again).
  static std::shared_ptr<ConfigStore> GetStore(const std::string& ns);

  // Makes `store` the global store; null returns to the default database.
  // Lets tests and tools run the configuration layer on a store of their
  // own. Handles already given out stay valid.
  static void SetGlobalStore(std::shared_ptr<ConfigStore> store);

  // The object with all its sub-objects, or null when absent.
  virtual ConfigStoreObjectPtr GetObject(const ConfigStoreObjectId& id) = 0;
  // Stores the object, replacing a stored one of the same id. `options`
  // must be 0.
  virtual void WriteObject(const ConfigStoreObjectPtr& object, int options) = 0;
  // Replaces the stored object of the same id; throws when there is none
  // (it was deleted meanwhile). `options` must be 0.
  virtual void UpdateObject(const ConfigStoreObjectPtr& object, int options) = 0;
  // Removes the object with all its sub-objects; false when it was absent.
  virtual bool DeleteObject(const ConfigStoreObjectId& id) = 0;
  // Every stored instance of the filter's key, group and component, in
  // instance order; possibly none.
  virtual std::vector<ConfigStoreObjectPtr> GetObjectsByFilter(const FilterSpecObject& filter) = 0;

  // The objects the filters select as one export text (export_codec.h).
  // Equal contents give byte-identical texts.
  virtual std::string Export(const std::vector<FilterSpecObject>& filters) = 0;
  // Replaces, in one transaction, every stored instance of each key, group
  // and component that `text` covers with the text's instances. A text that
  // the codec refuses, or that gives a known record value another type
  // (record_types.h), returns false with the reason appended to `errors` and
  // changes nothing; a database failure throws (and changes nothing).
  virtual bool Import(const std::string& text, std::vector<ErrorInfo>& errors) = 0;

  // The stored instances of the id's key, group and component that the
  // owner should restore at boot. `flags` must be 0 (all instances).
  virtual std::vector<ConfigStoreObjectPtr> GetDesiredUserConfigInstances(
      const ConfigStoreObjectId& id, int flags) = 0;
  // Marks (true) or unmarks (false) the instance of `id` as restored for
  // the current boot of the host. The object itself need not exist.
  virtual void SetBootStatus(const ConfigStoreObjectId& id, bool restored) = 0;
  // Whether the instance of `id` is marked restored for the current boot.
  virtual bool GetBootStatus(const ConfigStoreObjectId& id) = 0;
};

// The daemon's database: "/var/lib/zyrd/configstore.db" under ZYRD_ROOT.
std::string DefaultStorePath();

}  // namespace OrnaConfigStore
