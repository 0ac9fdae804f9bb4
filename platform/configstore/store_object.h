// The host configuration store's object model.
//
// A top-level object (ConfigStoreObject) is identified by key, group,
// component and instance, e.g. ("providers", "kms", "orna", "p1"). Every
// object carries named values (a string, a `long` or a list of strings) and
// sub-objects, each identified under its parent by name and instance
// (SubObjectId), which again carry values and sub-objects.
//
// Objects are in-memory working copies: reading one from the store gives a
// fresh tree, changes stay in memory until the top-level object is handed
// to the store's write or update, and that stores the whole tree at once.
// Handles to sub-objects (StoreObjectPtr) point into their parent's tree, so
// setting a value through one changes what the parent will write.
//
// Sub-objects of one name keep the order in which they were created (a
// provider's servers are tried in that order); values are kept by name.
//
// Objects are not thread-safe: one thread works on a tree at a time. String
// values may hold credentials and private keys: they live in memory that is
// overwritten with zeros whenever it is released, and the secure overloads
// of GetValue/SetValue move them without a plain copy on the way.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <variant>
#include <vector>

#include "platform/runtime/system.h"
#include "platform/util/secure_buffer.h"

namespace OrnaConfigStore {

extern const std::string kEmptyString;

// Every failure of the store library: database errors, bad identifiers,
// values read with the wrong type, duplicate sub-objects.
class ConfigStoreException : public HostCtl::Lib::HostCtlException {
 public:
  using HostCtl::Lib::HostCtlException::HostCtlException;
};

class ConfigStoreObjectId {
 public:
  // A top-level object id; the instance is set afterwards (empty for
  // singletons).
  ConfigStoreObjectId(std::string key, std::string group, std::string component);
  // All four parts. Sub-objects and sub-object filters use the form
  // (name, kEmptyString, kEmptyString, instance).
  ConfigStoreObjectId(std::string key, std::string group, std::string component,
                      std::string instance);

  const std::string& GetKey() const { return key_; }
  const std::string& GetGroup() const { return group_; }
  const std::string& GetComponent() const { return component_; }
  const std::string& GetInstanceId() const { return instance_; }
  void SetInstanceId(std::string instance) { instance_ = std::move(instance); }

  // Whether key, group and component are equal (the instance is ignored).
  bool SameScope(const ConfigStoreObjectId& other) const;
  // "key/group/component/instance", for messages.
  std::string ToString() const;

  auto operator<=>(const ConfigStoreObjectId&) const = default;

 private:
  std::string key_;
  std::string group_;
  std::string component_;
  std::string instance_;
};

class SubObjectId {
 public:
  explicit SubObjectId(std::string name, std::string instance = kEmptyString)
      : name_(std::move(name)), instance_(std::move(instance)) {}
  const std::string& GetName() const { return name_; }
  const std::string& GetInstanceId() const { return instance_; }

 private:
  std::string name_;
  std::string instance_;
};

// Selects objects by key, group and component (the instance of the id is
// ignored): every instance of a top-level key, or every instance of a
// sub-object name (four-string form, name as the key).
class FilterSpecObject {
 public:
  explicit FilterSpecObject(ConfigStoreObjectId id) : id_(std::move(id)) {}
  const ConfigStoreObjectId& GetConfigStoreObjectId() const { return id_; }

 private:
  ConfigStoreObjectId id_;
};

class StoreObject;
using StoreObjectPtr = std::shared_ptr<StoreObject>;

class StoreObject {
 public:
  using Text = Groundwork::SecureString::Base;
  using TextList = std::vector<Text, Groundwork::ZeroingAllocator<Text>>;
  using Value = std::variant<Text, long, TextList>;

  explicit StoreObject(ConfigStoreObjectId id) : id_(std::move(id)) {}
  virtual ~StoreObject();
  StoreObject(const StoreObject&) = delete;
  StoreObject& operator=(const StoreObject&) = delete;

  // The object's id; for a sub-object (name, "", "", instance).
  const ConfigStoreObjectId& GetConfigStoreObjectId() const { return id_; }

  // Copies the value into `*value` and returns true; false (and `*value`
  // untouched) when there is no value of that name. Throws
  // ConfigStoreException when the value has another type.
  bool GetValue(const std::string& name, std::string* value) const;
  bool GetValue(const std::string& name, long* value) const;
  bool GetValue(const std::string& name, std::vector<std::string>* value) const;
  // For secrets: the copy goes straight into wiping memory.
  bool GetValue(const std::string& name, Groundwork::SecureString* value) const;

  // Sets (or replaces, whatever its type was) the value. Throws
  // ConfigStoreException for an empty name.
  void SetValue(const std::string& name, const std::string& value);
  void SetValue(const std::string& name, long value);
  void SetValue(const std::string& name, const std::vector<std::string>& value);
  void SetValue(const std::string& name, const Groundwork::SecureString& value);
  // Sets a value of whichever type `value` holds (decoding stored text).
  void SetAnyValue(const std::string& name, Value value);
  // Returns whether a value was removed.
  bool DeleteValue(const std::string& name);

  const std::map<std::string, Value>& Values() const { return values_; }

  // The sub-object, or null when absent.
  StoreObjectPtr GetSubObject(const SubObjectId& id) const;
  // Adds an empty sub-object after the existing ones of its name. Throws
  // ConfigStoreException when it exists already or the name is empty.
  StoreObjectPtr CreateSubObject(const SubObjectId& id);
  // Returns whether a sub-object was removed (with everything under it).
  bool DeleteSubObject(const SubObjectId& id);
  // Every instance of the filter's name, in creation order.
  std::vector<StoreObjectPtr> GetSubObjectInstances(const FilterSpecObject& filter) const;
  // Removes every instance of the filter's name; returns how many.
  size_t DeleteSubObjectInstances(const FilterSpecObject& filter);
  // All sub-objects: names in order, instances of a name in creation order.
  std::vector<StoreObjectPtr> GetAllSubObjects() const;

 private:
  ConfigStoreObjectId id_;
  std::map<std::string, Value> values_;
  std::map<std::string, std::vector<StoreObjectPtr>> subObjects_;  // by name
};

// A top-level object. An object of key "providers" reports its instance id
// as its string value "provider".
class ConfigStoreObject : public StoreObject {
 public:
  // Throws ConfigStoreException when key, group or component is empty.
  explicit ConfigStoreObject(const ConfigStoreObjectId& id);
};
using ConfigStoreObjectPtr = std::shared_ptr<ConfigStoreObject>;

// The key whose objects carry their instance id as a value, and that value.
inline constexpr const char* kProvidersKey = "providers";
inline constexpr const char* kProviderIdValue = "provider";

}  // namespace OrnaConfigStore
