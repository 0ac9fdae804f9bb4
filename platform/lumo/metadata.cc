#include "platform/lumo/metadata.h"

#include <openssl/evp.h>

#include <boost/json/parse.hpp>
#include <boost/json/serialize.hpp>
#include <fstream>
#include <sstream>

#include "platform/lumo/core_messages.h"
#include "platform/util/hex.h"

namespace Lumo::Provider::Metadata {
namespace {

std::string Sha256Hex(const std::string& text) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int length = 0;
  EVP_Digest(text.data(), text.size(), digest, &length, EVP_sha256(), nullptr);
  return Groundwork::HexEncode({reinterpret_cast<const char*>(digest), length});
}

// The string member `key` of `obj`, or null (with `reason` set) when it is
// absent, not a string or empty.
const boost::json::string* StringMember(const boost::json::object& obj, std::string_view key,
                                        std::string_view where, std::string& reason) {
  const boost::json::value* v = obj.if_contains(key);
  if (v == nullptr || !v->is_string() || v->get_string().empty()) {
    reason = std::string(where) + ": \"" + std::string(key) + "\" must be a non-empty string";
    return nullptr;
  }
  return &v->get_string();
}

// The array member `key` (an absent member reads as empty when `optional`).
const boost::json::array* ArrayMember(const boost::json::object& obj, std::string_view key,
                                      std::string_view where, std::string& reason,
                                      bool optional = false) {
  static const boost::json::array kEmpty;
  const boost::json::value* v = obj.if_contains(key);
  if (v == nullptr && optional) return &kEmpty;
  if (v == nullptr || !v->is_array()) {
    reason = std::string(where) + ": \"" + std::string(key) + "\" must be a list";
    return nullptr;
  }
  return &v->get_array();
}

// Calls `fn(object, id)` for each entry of the list `key` of `obj`; each entry
// must be an object with a non-empty string member `idKey`.
template <typename Fn>
bool ForEachEntry(const boost::json::object& obj, std::string_view key, std::string_view idKey,
                  std::string_view where, std::string& reason, Fn fn, bool optional = false) {
  const boost::json::array* list = ArrayMember(obj, key, where, reason, optional);
  if (list == nullptr) return false;
  for (const auto& item : *list) {
    if (!item.is_object()) {
      reason = std::string(where) + ": entries of \"" + std::string(key) + "\" must be objects";
      return false;
    }
    const boost::json::string* id = StringMember(item.get_object(), idKey, where, reason);
    if (id == nullptr) return false;
    if (!fn(item.get_object(), std::string(id->data(), id->size()))) return false;
  }
  return true;
}

bool AddUnique(Index& index, const std::string& id, const boost::json::object* entry,
               std::string_view what, std::string& reason) {
  if (index.Add(id, entry)) return true;
  reason = "duplicate " + std::string(what) + " '" + id + "'";
  return false;
}

template <typename Container>
Data::ErrorValuePtr LoadSection(const std::string& path, std::string_view sectionName,
                                const std::string& component, Container& container) {
  auto fail = [&](const std::string& reason) {
    return std::make_shared<const Data::ErrorValue>(
        Com::Tarsel::Lumo::Std::Errors::Error::kName, Data::ErrorType::kError,
        std::vector<L10n::LocalizableMessage>{CoreMessages::Make(
            CoreMessages::kMetadataLoadFailed, {{"file", path}, {"reason", reason}})});
  };
  std::ifstream in(path, std::ios::binary);
  if (!in) return fail("cannot open the file");
  std::stringstream text;
  text << in.rdbuf();
  boost::system::error_code ec;
  boost::json::value root = boost::json::parse(text.str(), ec);
  if (ec) return fail("not valid JSON (" + ec.message() + ")");
  if (!root.is_object()) return fail("the file is not a JSON object");
  boost::json::value* section = root.get_object().if_contains(sectionName);
  if (section == nullptr || !section->is_object()) {
    return fail("no \"" + std::string(sectionName) + "\" section");
  }
  std::string reason;
  if (!container.Load(component, std::move(*section), reason)) return fail(reason);
  return nullptr;
}

}  // namespace

bool Index::Add(const std::string& id, const boost::json::object* entry) {
  if (!entries_.emplace(id, entry).second) return false;
  ids_.push_back(id);
  return true;
}

const boost::json::object* Index::Find(std::string_view id) const {
  auto it = entries_.find(id);
  return it == entries_.end() ? nullptr : it->second;
}

bool SectionContainer::Load(const std::string& component, boost::json::value section,
                            std::string& reason) {
  const boost::json::string* name =
      StringMember(section.get_object(), "component", "section", reason);
  if (name == nullptr) return false;
  if (*name != component) {
    reason = "the section is for component '" + std::string(name->data(), name->size()) +
             "', not '" + component + "'";
    return false;
  }
  component_ = component;
  section_ = std::move(section);
  fingerprint_ = Sha256Hex(boost::json::serialize(section_));
  return Index(reason);
}

namespace Cli {

std::string MetadataContainer::Key(std::string_view path, std::string_view name) {
  std::string key(path);
  key += '|';
  key += name;
  return key;
}

bool MetadataContainer::Index(std::string& reason) {
  auto indexList = [&](std::string_view list, Metadata::Index& index, std::string_view what) {
    return ForEachEntry(
        Section(), list, "name", list, reason,
        [&](const boost::json::object& entry, const std::string& name) {
          const boost::json::value* path = entry.if_contains("path");
          if (path == nullptr || !path->is_string()) {
            reason = std::string(what) + " '" + name + "': \"path\" must be a string";
            return false;
          }
          return AddUnique(index, Key(path->get_string(), name), &entry, what, reason);
        });
  };
  return indexList("namespaces", namespaces_, "namespace") &&
         indexList("commands", commands_, "command");
}

}  // namespace Cli

namespace Metamodel {

bool MetadataContainer::CheckType(const boost::json::value& type, std::string& reason) const {
  static constexpr std::string_view kBuiltins[] = {
      "string", "long", "boolean", "binary", "secret", "date_time", "localizable_message", "void"};
  if (type.is_string()) {
    for (auto b : kBuiltins) {
      if (type.get_string() == b) return true;
    }
    reason = "unknown type '" + std::string(type.get_string()) + "'";
    return false;
  }
  if (!type.is_object() || type.get_object().size() != 1) {
    reason = "a type is a name or an object with one member";
    return false;
  }
  const auto& [kind, inner] = *type.get_object().begin();
  if (kind == "optional" || kind == "list" || kind == "set") return CheckType(inner, reason);
  if ((kind == "structure" || kind == "enumeration") && inner.is_string()) {
    const Metadata::Index& index = kind == "structure" ? structures_ : enumerations_;
    if (index.Find(inner.get_string()) != nullptr) return true;
    reason = "unknown " + std::string(kind) + " '" + std::string(inner.get_string()) + "'";
    return false;
  }
  reason = "unknown type kind '" + std::string(kind) + "'";
  return false;
}

bool MetadataContainer::IndexTypes(const boost::json::object& package, std::string& reason) {
  return ForEachEntry(
             package, "structures", "id", "structures", reason,
             [&](const boost::json::object& s, const std::string& id) {
               return AddUnique(structures_, id, &s, "structure", reason);
             },
             true) &&
         ForEachEntry(
             package, "enumerations", "id", "enumerations", reason,
             [&](const boost::json::object& e, const std::string& id) {
               return AddUnique(enumerations_, id, &e, "enumeration", reason);
             },
             true) &&
         ForEachEntry(
             package, "resources", "type", "resources", reason,
             [&](const boost::json::object& r, const std::string& id) {
               return AddUnique(resources_, id, &r, "resource", reason);
             },
             true);
}

// Every member of the list `list` of `owner` (fields, params) has a name and
// a valid type.
bool MetadataContainer::CheckMembers(const boost::json::object& owner, std::string_view list,
                                     const std::string& where, std::string& reason) const {
  return ForEachEntry(
      owner, list, "name", where, reason,
      [&](const boost::json::object& member, const std::string& name) {
        const boost::json::value* type = member.if_contains("type");
        if (type == nullptr || !CheckType(*type, reason)) {
          reason = where + "." + name + ": " + (type == nullptr ? "no type" : reason);
          return false;
        }
        return true;
      },
      true);
}

bool MetadataContainer::IndexServices(const boost::json::object& package, std::string& reason) {
  return ForEachEntry(package, "services", "id", "services", reason,
                      [&](const boost::json::object& service, const std::string& serviceId) {
                        if (!AddUnique(services_, serviceId, &service, "service", reason))
                          return false;
                        const boost::json::value* hidden = service.if_contains("hidden");
                        if (hidden != nullptr && hidden->is_bool() && hidden->get_bool()) {
                          hidden_.push_back(serviceId);
                        }
                        return ForEachEntry(
                            service, "operations", "id", serviceId, reason,
                            [&](const boost::json::object& op, const std::string& opId) {
                              std::string method = serviceId + "." + opId;
                              if (!AddUnique(operations_, method, &op, "operation", reason))
                                return false;
                              const boost::json::value* output = op.if_contains("output");
                              if (output == nullptr || !CheckType(*output, reason)) {
                                reason =
                                    method + " output: " + (output == nullptr ? "missing" : reason);
                                return false;
                              }
                              return CheckMembers(op, "params", method, reason);
                            });
                      });
}

bool MetadataContainer::Index(std::string& reason) {
  // Types first, across all packages, so that any member may name any of them.
  if (!ForEachEntry(Section(), "packages", "id", "packages", reason,
                    [&](const boost::json::object& package, const std::string& id) {
                      return AddUnique(packages_, id, &package, "package", reason) &&
                             IndexTypes(package, reason);
                    })) {
    return false;
  }
  for (const std::string& id : structures_.Ids()) {
    if (!CheckMembers(*structures_.Find(id), "fields", id, reason)) return false;
  }
  for (const std::string& id : packages_.Ids()) {
    if (!IndexServices(*packages_.Find(id), reason)) return false;
  }
  return true;
}

}  // namespace Metamodel

namespace Authentication {

bool MetadataContainer::Index(std::string& reason) {
  return ForEachEntry(Section(), "packages", "id", "packages", reason,
                      [&](const boost::json::object& package, const std::string& packageId) {
                        if (!AddUnique(packages_, packageId, &package, "package", reason))
                          return false;
                        return ForEachEntry(
                            package, "services", "id", packageId, reason,
                            [&](const boost::json::object& service, const std::string& serviceId) {
                              if (!AddUnique(services_, serviceId, &service, "service", reason))
                                return false;
                              return ForEachEntry(
                                  service, "operations", "id", serviceId, reason,
                                  [&](const boost::json::object& op, const std::string& opId) {
                                    return AddUnique(operations_, serviceId + "." + opId, &op,
                                                     "operation", reason) &&
                                           ArrayMember(op, "schemes", serviceId + "." + opId,
                                                       reason) != nullptr;
                                  });
                            });
                      });
}

}  // namespace Authentication

namespace ProviderHelper {

Data::ErrorValuePtr LoadCliMetadataFile(const std::string& path, const std::string& component,
                                        Cli::MetadataContainer& container) {
  return LoadSection(path, "cli", component, container);
}

Data::ErrorValuePtr LoadMetamodelMetadataFile(const std::string& path, const std::string& component,
                                              Metamodel::MetadataContainer& container) {
  return LoadSection(path, "metamodel", component, container);
}

Data::ErrorValuePtr LoadAuthnMetadataFile(const std::string& path, const std::string& component,
                                          Authentication::MetadataContainer& container) {
  return LoadSection(path, "authentication", component, container);
}

}  // namespace ProviderHelper
}  // namespace Lumo::Provider::Metadata
