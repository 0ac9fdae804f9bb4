#include "platform/configstore/export_codec.h"

#include <algorithm>
#include <boost/json.hpp>
#include <climits>
#include <initializer_list>
#include <set>

#include "platform/util/wiping_json.h"

namespace OrnaConfigStore::Codec {
namespace {

namespace json = boost::json;

// ---- encoding ----

json::object EncodeNode(const StoreObject& object, json::object node) {
  json::object values(node.storage());
  for (const auto& [name, value] : object.Values()) {
    if (const auto* s = std::get_if<StoreObject::Text>(&value)) {
      values.emplace(name, json::string(std::string_view(*s), node.storage()));
    } else if (const auto* n = std::get_if<long>(&value)) {
      values.emplace(name, static_cast<int64_t>(*n));
    } else {
      json::array list(node.storage());
      for (const auto& item : std::get<StoreObject::TextList>(value)) {
        list.emplace_back(json::string(std::string_view(item), node.storage()));
      }
      values.emplace(name, std::move(list));
    }
  }
  json::array subObjects(node.storage());
  for (const auto& sub : object.GetAllSubObjects()) {
    const auto& id = sub->GetConfigStoreObjectId();
    json::object subNode(node.storage());
    subNode.emplace("name", id.GetKey());
    subNode.emplace("instance", id.GetInstanceId());
    subObjects.emplace_back(EncodeNode(*sub, std::move(subNode)));
  }
  node.emplace("values", std::move(values));
  node.emplace("subObjects", std::move(subObjects));
  return node;
}

json::object EncodeTopLevel(const ConfigStoreObject& object, const json::storage_ptr& sp) {
  const auto& id = object.GetConfigStoreObjectId();
  json::object node(sp);
  node.emplace("key", id.GetKey());
  node.emplace("group", id.GetGroup());
  node.emplace("component", id.GetComponent());
  node.emplace("instance", id.GetInstanceId());
  return EncodeNode(object, std::move(node));
}

// ---- decoding ----

struct DecodeError {
  std::string message;
};

[[noreturn]] void Fail(const std::string& path, const std::string& what) {
  throw DecodeError{path.empty() ? what : path + ": " + what};
}

const json::object& AsObject(const json::value& v, const std::string& path) {
  if (!v.is_object()) Fail(path, "not a JSON object");
  return v.get_object();
}

const json::array& AsArray(const json::value& v, const std::string& path) {
  if (!v.is_array()) Fail(path, "not a JSON array");
  return v.get_array();
}

std::string AsString(const json::value& v, const std::string& path) {
  if (!v.is_string()) Fail(path, "not a JSON string");
  return std::string(v.get_string());
}

std::string NonEmptyString(const json::value& v, const std::string& path) {
  std::string s = AsString(v, path);
  if (s.empty()) Fail(path, "empty");
  return s;
}

const json::value& Required(const json::object& o, std::string_view name, const std::string& path) {
  const json::value* v = o.if_contains(name);
  if (v == nullptr) Fail(path, "missing \"" + std::string(name) + "\"");
  return *v;
}

void CheckMembers(const json::object& o, std::initializer_list<std::string_view> allowed,
                  const std::string& path) {
  for (const auto& member : o) {
    if (std::find(allowed.begin(), allowed.end(), member.key()) == allowed.end()) {
      Fail(path, "unexpected member \"" + std::string(member.key()) + "\"");
    }
  }
}

std::string Join(const std::string& path, std::string_view member) {
  return path.empty() ? std::string(member) : path + "." + std::string(member);
}

std::string Index(const std::string& path, size_t i) {
  return path + "[" + std::to_string(i) + "]";
}

void DecodeValues(const json::object& values, StoreObject& target, const std::string& path) {
  for (const auto& member : values) {
    std::string name(member.key());
    std::string where = Join(path, name);
    if (name.empty()) Fail(path, "empty value name");
    const json::value& v = member.value();
    if (v.is_string()) {
      target.SetAnyValue(name, StoreObject::Text(v.get_string()));
    } else if (v.is_int64()) {
      target.SetValue(name, static_cast<long>(v.get_int64()));
    } else if (v.is_uint64() && v.get_uint64() <= static_cast<uint64_t>(LONG_MAX)) {
      target.SetValue(name, static_cast<long>(v.get_uint64()));
    } else if (v.is_array()) {
      StoreObject::TextList list;
      list.reserve(v.get_array().size());
      for (const auto& item : v.get_array()) {
        if (!item.is_string()) Fail(where, "a list holds only strings");
        list.emplace_back(item.get_string());
      }
      target.SetAnyValue(name, std::move(list));
    } else {
      Fail(where, "a value is a string, an integer or a list of strings");
    }
  }
}

void DecodeNode(const json::object& node, StoreObject& target, const std::string& path);

void DecodeSubObjects(const json::array& subs, StoreObject& parent, const std::string& path) {
  for (size_t i = 0; i < subs.size(); ++i) {
    std::string where = Index(path, i);
    const json::object& node = AsObject(subs[i], where);
    CheckMembers(node, {"name", "instance", "values", "subObjects"}, where);
    SubObjectId id(NonEmptyString(Required(node, "name", where), Join(where, "name")),
                   AsString(Required(node, "instance", where), Join(where, "instance")));
    if (parent.GetSubObject(id)) {
      Fail(where,
           "duplicate sub-object \"" + id.GetName() + "\" instance \"" + id.GetInstanceId() + "\"");
    }
    DecodeNode(node, *parent.CreateSubObject(id), where);
  }
}

void DecodeNode(const json::object& node, StoreObject& target, const std::string& path) {
  if (const json::value* values = node.if_contains("values")) {
    DecodeValues(AsObject(*values, Join(path, "values")), target, Join(path, "values"));
  }
  if (const json::value* subs = node.if_contains("subObjects")) {
    DecodeSubObjects(AsArray(*subs, Join(path, "subObjects")), target, Join(path, "subObjects"));
  }
}

ConfigStoreObjectId DecodeScope(const json::object& node, const std::string& path) {
  return ConfigStoreObjectId(
      NonEmptyString(Required(node, "key", path), Join(path, "key")),
      NonEmptyString(Required(node, "group", path), Join(path, "group")),
      NonEmptyString(Required(node, "component", path), Join(path, "component")));
}

ConfigStoreObjectPtr DecodeTopLevel(const json::object& node, const std::string& path) {
  CheckMembers(node, {"key", "group", "component", "instance", "values", "subObjects"}, path);
  ConfigStoreObjectId id = DecodeScope(node, path);
  id.SetInstanceId(AsString(Required(node, "instance", path), Join(path, "instance")));
  auto object = std::make_shared<ConfigStoreObject>(id);
  DecodeNode(node, *object, path);
  std::string provider;
  if (id.GetKey() == kProvidersKey &&
      (!object->GetValue(kProviderIdValue, &provider) || provider != id.GetInstanceId())) {
    Fail(Join(path, "values"), "\"provider\" must be the instance id");
  }
  return object;
}

json::value Parse(std::string_view text) {
  json::parse_options options;
  options.allow_invalid_utf8 = true;  // accept every text that export writes
  boost::system::error_code ec;
  json::value root = json::parse(text, ec, Groundwork::WipingJsonStorage(), options);
  if (ec) Fail("", "not valid JSON (" + ec.message() + ")");
  return root;
}

void SortScopes(std::vector<ConfigStoreObjectId>& scopes) {
  for (auto& scope : scopes) scope.SetInstanceId(kEmptyString);
  std::sort(scopes.begin(), scopes.end());
  scopes.erase(std::unique(scopes.begin(), scopes.end()), scopes.end());
}

}  // namespace

std::string EncodeExport(const std::vector<ConfigStoreObjectId>& scopes,
                         std::vector<ConfigStoreObjectPtr> objects) {
  std::sort(objects.begin(), objects.end(), [](const auto& a, const auto& b) {
    return a->GetConfigStoreObjectId() < b->GetConfigStoreObjectId();
  });
  std::vector<ConfigStoreObjectId> sortedScopes = scopes;
  for (const auto& object : objects) sortedScopes.push_back(object->GetConfigStoreObjectId());
  SortScopes(sortedScopes);

  json::storage_ptr sp = Groundwork::WipingJsonStorage();
  json::array scopeList(sp);
  for (const auto& scope : sortedScopes) {
    scopeList.emplace_back(json::object(
        {{"key", scope.GetKey()}, {"group", scope.GetGroup()}, {"component", scope.GetComponent()}},
        sp));
  }
  json::array objectList(sp);
  for (size_t i = 0; i < objects.size(); ++i) {
    if (i > 0 && objects[i - 1]->GetConfigStoreObjectId() == objects[i]->GetConfigStoreObjectId()) {
      throw ConfigStoreException("two objects " + objects[i]->GetConfigStoreObjectId().ToString());
    }
    objectList.emplace_back(EncodeTopLevel(*objects[i], sp));
  }
  json::object root(sp);
  root.emplace("format", kExportFormat);
  root.emplace("version", static_cast<int64_t>(kExportVersion));
  root.emplace("scope", std::move(scopeList));
  root.emplace("objects", std::move(objectList));
  return Groundwork::SerializeWiping(root);
}

bool DecodeExport(std::string_view text, ExportContents& contents, std::string& error) {
  try {
    json::value root = Parse(text);
    const json::object& top = AsObject(root, "export");
    CheckMembers(top, {"format", "version", "scope", "objects"}, "export");
    const json::value& format = Required(top, "format", "export");
    if (!format.is_string() || format.get_string() != kExportFormat) {
      Fail("format", "not \"" + std::string(kExportFormat) + "\"");
    }
    const json::value& version = Required(top, "version", "export");
    if (!(version.is_int64() && version.get_int64() == kExportVersion) &&
        !(version.is_uint64() && version.get_uint64() == kExportVersion)) {
      Fail("version", "unsupported version " + json::serialize(version));
    }

    ExportContents decoded;
    if (const json::value* scope = top.if_contains("scope")) {
      const json::array& list = AsArray(*scope, "scope");
      for (size_t i = 0; i < list.size(); ++i) {
        std::string where = Index("scope", i);
        const json::object& node = AsObject(list[i], where);
        CheckMembers(node, {"key", "group", "component"}, where);
        decoded.scopes.push_back(DecodeScope(node, where));
      }
    }
    const json::array& objects = AsArray(Required(top, "objects", "export"), "objects");
    std::set<ConfigStoreObjectId> seen;
    for (size_t i = 0; i < objects.size(); ++i) {
      std::string where = Index("objects", i);
      auto object = DecodeTopLevel(AsObject(objects[i], where), where);
      const auto& id = object->GetConfigStoreObjectId();
      if (!seen.insert(id).second) Fail(where, "duplicate object " + id.ToString());
      decoded.scopes.push_back(id);
      decoded.objects.push_back(std::move(object));
    }
    SortScopes(decoded.scopes);
    contents = std::move(decoded);
    return true;
  } catch (const DecodeError& e) {
    error = e.message;
    return false;
  } catch (const ConfigStoreException& e) {
    error = e.what();
    return false;
  }
}

std::string EncodeObject(const ConfigStoreObject& object) {
  return Groundwork::SerializeWiping(EncodeTopLevel(object, Groundwork::WipingJsonStorage()));
}

std::string EncodeBody(const StoreObject& object) {
  return Groundwork::SerializeWiping(
      EncodeNode(object, json::object(Groundwork::WipingJsonStorage())));
}

void DecodeBody(std::string_view body, StoreObject& object) {
  try {
    json::value root = Parse(body);
    const json::object& node = AsObject(root, "");
    CheckMembers(node, {"values", "subObjects"}, "");
    DecodeNode(node, object, "");
  } catch (const DecodeError& e) {
    throw ConfigStoreException("stored object " + object.GetConfigStoreObjectId().ToString() +
                               " is corrupt: " + e.message);
  }
}

}  // namespace OrnaConfigStore::Codec
