#include "platform/configstore/store_object.h"

#include <openssl/crypto.h>

#include <algorithm>

namespace OrnaConfigStore {

const std::string kEmptyString;

namespace {

using Text = StoreObject::Text;
using TextList = StoreObject::TextList;

// Clears the bytes of short strings, which sit inside the string object and
// never reach the allocator; longer ones are wiped when released.
void WipeValue(StoreObject::Value& value) {
  if (auto* s = std::get_if<Text>(&value)) {
    OPENSSL_cleanse(s->data(), s->capacity());
  } else if (auto* list = std::get_if<TextList>(&value)) {
    for (auto& item : *list) OPENSSL_cleanse(item.data(), item.capacity());
  }
}

const char* TypeName(const StoreObject::Value& value) {
  switch (value.index()) {
    case 0:
      return "a string";
    case 1:
      return "a number";
    default:
      return "a list of strings";
  }
}

// The value of `name` as a T, null when absent; throws for another type.
template <typename T>
const T* Typed(const std::map<std::string, StoreObject::Value>& values, const std::string& name,
               const char* wanted, const ConfigStoreObjectId& id) {
  auto it = values.find(name);
  if (it == values.end()) return nullptr;
  const T* typed = std::get_if<T>(&it->second);
  if (typed == nullptr) {
    throw ConfigStoreException("value '" + name + "' of " + id.ToString() + " is " +
                               TypeName(it->second) + ", not " + wanted);
  }
  return typed;
}

void CheckName(const std::string& name, const char* what) {
  if (name.empty()) throw ConfigStoreException(std::string("empty ") + what + " name");
}

}  // namespace

ConfigStoreObjectId::ConfigStoreObjectId(std::string key, std::string group, std::string component)
    : key_(std::move(key)), group_(std::move(group)), component_(std::move(component)) {}

ConfigStoreObjectId::ConfigStoreObjectId(std::string key, std::string group, std::string component,
                                         std::string instance)
    : key_(std::move(key)),
      group_(std::move(group)),
      component_(std::move(component)),
      instance_(std::move(instance)) {}

bool ConfigStoreObjectId::SameScope(const ConfigStoreObjectId& other) const {
  return key_ == other.key_ && group_ == other.group_ && component_ == other.component_;
}

std::string ConfigStoreObjectId::ToString() const {
  return key_ + "/" + group_ + "/" + component_ + "/" + instance_;
}

StoreObject::~StoreObject() {
  for (auto& [name, value] : values_) WipeValue(value);
}

bool StoreObject::GetValue(const std::string& name, std::string* value) const {
  const Text* text = Typed<Text>(values_, name, "a string", id_);
  if (text != nullptr) value->assign(text->data(), text->size());
  return text != nullptr;
}

bool StoreObject::GetValue(const std::string& name, long* value) const {
  const long* number = Typed<long>(values_, name, "a number", id_);
  if (number != nullptr) *value = *number;
  return number != nullptr;
}

bool StoreObject::GetValue(const std::string& name, std::vector<std::string>* value) const {
  const TextList* list = Typed<TextList>(values_, name, "a list of strings", id_);
  if (list != nullptr) value->assign(list->begin(), list->end());
  return list != nullptr;
}

bool StoreObject::GetValue(const std::string& name, Groundwork::SecureString* value) const {
  const Text* text = Typed<Text>(values_, name, "a string", id_);
  if (text != nullptr) value->assign(*text);
  return text != nullptr;
}

void StoreObject::SetValue(const std::string& name, const std::string& value) {
  SetAnyValue(name, Text(value.data(), value.size()));
}

void StoreObject::SetValue(const std::string& name, long value) { SetAnyValue(name, value); }

void StoreObject::SetValue(const std::string& name, const std::vector<std::string>& value) {
  TextList list;
  list.reserve(value.size());
  for (const auto& item : value) list.emplace_back(item.data(), item.size());
  SetAnyValue(name, std::move(list));
}

void StoreObject::SetValue(const std::string& name, const Groundwork::SecureString& value) {
  SetAnyValue(name, Text(value.data(), value.size()));
}

void StoreObject::SetAnyValue(const std::string& name, Value value) {
  CheckName(name, "value");
  auto [it, inserted] = values_.try_emplace(name);
  WipeValue(it->second);
  it->second = std::move(value);
  WipeValue(value);  // a short string moved out leaves its bytes behind
}

bool StoreObject::DeleteValue(const std::string& name) {
  auto it = values_.find(name);
  if (it == values_.end()) return false;
  WipeValue(it->second);
  values_.erase(it);
  return true;
}

StoreObjectPtr StoreObject::GetSubObject(const SubObjectId& id) const {
  auto it = subObjects_.find(id.GetName());
  if (it == subObjects_.end()) return nullptr;
  for (const auto& sub : it->second) {
    if (sub->GetConfigStoreObjectId().GetInstanceId() == id.GetInstanceId()) return sub;
  }
  return nullptr;
}

StoreObjectPtr StoreObject::CreateSubObject(const SubObjectId& id) {
  CheckName(id.GetName(), "sub-object");
  if (GetSubObject(id)) {
    throw ConfigStoreException("sub-object '" + id.GetName() + "' instance '" + id.GetInstanceId() +
                               "' of " + id_.ToString() + " exists already");
  }
  auto sub = std::make_shared<StoreObject>(
      ConfigStoreObjectId(id.GetName(), kEmptyString, kEmptyString, id.GetInstanceId()));
  subObjects_[id.GetName()].push_back(sub);
  return sub;
}

bool StoreObject::DeleteSubObject(const SubObjectId& id) {
  auto it = subObjects_.find(id.GetName());
  if (it == subObjects_.end()) return false;
  auto& list = it->second;
  auto pos = std::find_if(list.begin(), list.end(), [&](const StoreObjectPtr& sub) {
    return sub->GetConfigStoreObjectId().GetInstanceId() == id.GetInstanceId();
  });
  if (pos == list.end()) return false;
  list.erase(pos);
  if (list.empty()) subObjects_.erase(it);
  return true;
}

std::vector<StoreObjectPtr> StoreObject::GetSubObjectInstances(
    const FilterSpecObject& filter) const {
  auto it = subObjects_.find(filter.GetConfigStoreObjectId().GetKey());
  return it == subObjects_.end() ? std::vector<StoreObjectPtr>() : it->second;
}

size_t StoreObject::DeleteSubObjectInstances(const FilterSpecObject& filter) {
  auto it = subObjects_.find(filter.GetConfigStoreObjectId().GetKey());
  if (it == subObjects_.end()) return 0;
  size_t count = it->second.size();
  subObjects_.erase(it);
  return count;
}

std::vector<StoreObjectPtr> StoreObject::GetAllSubObjects() const {
  std::vector<StoreObjectPtr> all;
  for (const auto& [name, list] : subObjects_) all.insert(all.end(), list.begin(), list.end());
  return all;
}

ConfigStoreObject::ConfigStoreObject(const ConfigStoreObjectId& id) : StoreObject(id) {
  if (id.GetKey().empty() || id.GetGroup().empty() || id.GetComponent().empty()) {
    throw ConfigStoreException("incomplete object id " + id.ToString());
  }
  if (id.GetKey() == kProvidersKey) SetValue(kProviderIdValue, id.GetInstanceId());
}

}  // namespace OrnaConfigStore
