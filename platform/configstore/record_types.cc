#include "platform/configstore/record_types.h"

#include <string_view>
#include <variant>

namespace OrnaConfigStore {
namespace {

enum class Type { kString, kLong, kList };

struct KnownValue {
  std::string_view path;  // sub-object names from the provider down, '/'-separated
  std::string_view name;
  Type type;
};

// The provider tree: see the configuration layer's description of it.
constexpr KnownValue kProviderValues[] = {
    {"", "provider", Type::kString},
    {"", "master_key_id", Type::kString},
    {"key_server", "type", Type::kString},
    {"key_server", "description", Type::kString},
    {"key_server", "connection_timeout", Type::kLong},
    {"key_server", "server_cert", Type::kList},
    {"key_server/proxy_server", "hostname", Type::kString},
    {"key_server/proxy_server", "port", Type::kLong},
    {"key_server/kmip_server", "username", Type::kString},
    {"key_server/kmip_server", "credential", Type::kString},
    {"key_server/kmip_server/servers", "name", Type::kString},
    {"key_server/kmip_server/servers", "hostname", Type::kString},
    {"key_server/kmip_server/servers", "port", Type::kLong},
    {"key_server/kmip_server/client_certificate", "certificate", Type::kString},
    {"key_server/kmip_server/client_certificate", "private_key", Type::kString},
    {"key_server/kmip_server/client_CSR", "certificate", Type::kString},
    {"key_server/kmip_server/client_CSR", "private_key", Type::kString},
};

const char* TypeName(Type type) {
  switch (type) {
    case Type::kString:
      return "a string";
    case Type::kLong:
      return "an integer";
    case Type::kList:
      return "a list of strings";
  }
  return "";
}

bool HasType(const StoreObject::Value& value, Type type) {
  switch (type) {
    case Type::kString:
      return std::holds_alternative<StoreObject::Text>(value);
    case Type::kLong:
      return std::holds_alternative<long>(value);
    case Type::kList:
      return std::holds_alternative<StoreObject::TextList>(value);
  }
  return false;
}

bool CheckNode(const StoreObject& object, const std::string& path, const std::string& where,
               std::string& error) {
  for (const auto& known : kProviderValues) {
    if (known.path != path) continue;
    auto it = object.Values().find(std::string(known.name));
    if (it != object.Values().end() && !HasType(it->second, known.type)) {
      error = where + ": \"" + std::string(known.name) + "\" must be " + TypeName(known.type);
      return false;
    }
  }
  for (const auto& sub : object.GetAllSubObjects()) {
    const auto& id = sub->GetConfigStoreObjectId();
    std::string subPath = path.empty() ? id.GetKey() : path + "/" + id.GetKey();
    std::string subWhere = where + "/" + id.GetKey();
    if (!id.GetInstanceId().empty()) subWhere += "[" + id.GetInstanceId() + "]";
    if (!CheckNode(*sub, subPath, subWhere, error)) return false;
  }
  return true;
}

}  // namespace

bool CheckRecordTypes(const std::vector<ConfigStoreObjectPtr>& objects, std::string& error) {
  const ConfigStoreObjectId providers(kProvidersKey, "kms", "orna");
  for (const auto& object : objects) {
    const auto& id = object->GetConfigStoreObjectId();
    if (!id.SameScope(providers)) continue;
    if (!CheckNode(*object, "", id.ToString(), error)) return false;
  }
  return true;
}

}  // namespace OrnaConfigStore
