#include "platform/kmip/command.h"

#include <set>

namespace Qlc {
namespace {

bool Fail(std::string* error, const std::string& what) {
  *error = "invalid command: " + what;
  return false;
}

bool ReadOptions(const TextItem& options, Request* out, std::string* error) {
  if (!options.isList || options.list.size() != 1 || options.list[0].name != "Authentication" ||
      !options.list[0].isList) {
    return Fail(error, "Options must be {Authentication={User=..., Password=...}}");
  }
  const TextItem* user = nullptr;
  const TextItem* password = nullptr;
  for (const TextItem& item : options.list[0].list) {
    const TextItem** slot = item.name == "User"       ? &user
                            : item.name == "Password" ? &password
                                                      : nullptr;
    if (slot == nullptr) return Fail(error, "unknown item '" + item.name + "' in Authentication");
    if (*slot != nullptr) return Fail(error, "item '" + item.name + "' given twice");
    if (!item.hasValue || item.isList) return Fail(error, item.name + " needs a text value");
    *slot = &item;
  }
  if (user == nullptr || password == nullptr) {
    return Fail(error, "Authentication needs both User and Password");
  }
  out->withCredential = true;
  out->username = user->text;
  out->password = password->text;
  return true;
}

bool ReadNames(const TextItem& names, Request* out, std::string* error) {
  if (!names.isList) {
    if (names.text.empty()) return Fail(error, "empty attribute name");
    out->attributeNames.emplace_back(names.text.view());
    return true;
  }
  for (const TextItem& n : names.list) {
    if (n.hasValue) return Fail(error, "attribute names take no value");
    out->attributeNames.push_back(n.name);
  }
  if (out->attributeNames.empty()) return Fail(error, "Names lists no attribute");
  return true;
}

}  // namespace

bool ParseCommand(std::string_view text, ValueSource* source, Request* out, std::string* error) {
  std::vector<TextItem> items;
  if (!ParseItemList(text, source, &items, error)) {
    *error = "invalid command: " + *error;
    return false;
  }
  int major = out->versionMajor;
  int minor = out->versionMinor;
  *out = Request();
  out->versionMajor = major;
  out->versionMinor = minor;
  if (items.size() < 2 || items[0].hasValue || items[1].hasValue) {
    return Fail(error, "expected 'Query, Versions', 'Get, Object, ...' or 'Get, Attributes, ...'");
  }
  const std::string& verb = items[0].name;
  const std::string& what = items[1].name;
  std::set<std::string> allowed = {"Options"};
  if (verb == "Query" && what == "Versions") {
    out->operation = Operation::kDiscoverVersions;
  } else if (verb == "Get" && what == "Object") {
    out->operation = Operation::kGet;
    allowed.insert("Id");
  } else if (verb == "Get" && what == "Attributes") {
    out->operation = Operation::kGetAttributes;
    allowed.insert({"Id", "Names"});
  } else {
    return Fail(error, "unknown command '" + verb + ", " + what + "'");
  }
  std::set<std::string> seen;
  for (size_t i = 2; i < items.size(); ++i) {
    const TextItem& item = items[i];
    if (!allowed.count(item.name)) return Fail(error, "unknown item '" + item.name + "'");
    if (!seen.insert(item.name).second) return Fail(error, "item '" + item.name + "' given twice");
    if (!item.hasValue) return Fail(error, "item '" + item.name + "' needs a value");
    if (item.name == "Options") {
      if (!ReadOptions(item, out, error)) return false;
    } else if (item.name == "Names") {
      if (!ReadNames(item, out, error)) return false;
    } else {
      if (item.isList || item.text.empty()) return Fail(error, "Id needs a non-empty text value");
      out->uniqueIdentifier.assign(item.text.view());
    }
  }
  if (allowed.count("Id") && out->uniqueIdentifier.empty()) return Fail(error, "missing Id");
  return true;
}

}  // namespace Qlc
