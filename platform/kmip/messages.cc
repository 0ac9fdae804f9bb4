#include "platform/kmip/messages.h"

#include <cstdio>

namespace Qlc {
namespace {

namespace T = Ttlv::Tag;
using Ttlv::Item;
using Ttlv::Type;

constexpr uint32_t kCredentialUsernamePassword = 1;
constexpr uint32_t kKeyFormatRaw = 1;

const char* StatusName(uint32_t status) {
  switch (status) {
    case 0:
      return "Success";
    case 1:
      return "Operation Failed";
    case 2:
      return "Operation Pending";
    case 3:
      return "Operation Undone";
    default:
      return "unknown";
  }
}

const char* ReasonName(int64_t reason) {
  switch (reason) {
    case 0x01:
      return "Item Not Found";
    case 0x02:
      return "Response Too Large";
    case 0x03:
      return "Authentication Not Successful";
    case 0x04:
      return "Invalid Message";
    case 0x05:
      return "Operation Not Supported";
    case 0x06:
      return "Missing Data";
    case 0x07:
      return "Invalid Field";
    case 0x08:
      return "Feature Not Supported";
    case 0x09:
      return "Operation Canceled By Requester";
    case 0x0A:
      return "Cryptographic Failure";
    case 0x0B:
      return "Illegal Operation";
    case 0x0C:
      return "Permission Denied";
    case 0x0D:
      return "Object Archived";
    case 0x0E:
      return "Index Out Of Bounds";
    case 0x0F:
      return "Application Namespace Not Supported";
    case 0x10:
      return "Key Format Type Not Supported";
    case 0x11:
      return "Key Compression Type Not Supported";
    case 0x100:
      return "General Failure";
    default:
      return "unknown";
  }
}

// The member `tag` of `parent` when it has type `type`; null when absent. A
// member of another type is an error.
bool Member(const Item& parent, uint32_t tag, Type type, const Item** out, std::string* error) {
  *out = parent.Find(tag);
  if (*out != nullptr && (*out)->type != type) {
    char buf[96];
    std::snprintf(buf, sizeof buf, "invalid KMIP response: item %06X has type %u, expected %u", tag,
                  static_cast<unsigned>((*out)->type), static_cast<unsigned>(type));
    *error = buf;
    return false;
  }
  return true;
}

bool Required(const Item& parent, uint32_t tag, Type type, const Item** out, std::string* error,
              const char* what) {
  if (!Member(parent, tag, type, out, error)) return false;
  if (*out == nullptr) {
    *error = std::string("invalid KMIP response: missing ") + what;
    return false;
  }
  return true;
}

void AddValue(Node* parent, std::string name, const Item& value);

void AddStructure(Node* node, const Item& item) {
  for (const Item& c : item.children) {
    char name[16];
    std::snprintf(name, sizeof name, "Tag_%06X", c.tag);
    AddValue(node, name, c);
  }
}

void AddValue(Node* parent, std::string name, const Item& value) {
  if (value.IsIntegral()) {
    parent->Add(std::move(name), Node::Kind::kInteger).integer = value.integer;
  } else if (value.type == Type::kTextString) {
    parent->Add(std::move(name), Node::Kind::kText).bytes = value.bytes;
  } else if (value.type == Type::kByteString || value.type == Type::kBigInteger) {
    parent->Add(std::move(name), Node::Kind::kBytes).bytes = value.bytes;
  } else {
    AddStructure(&parent->Add(std::move(name), Node::Kind::kStructure), value);
  }
}

void AddIfType(Node* parent, const char* name, const Item* item, Type type) {
  if (item != nullptr && item->type == type) AddValue(parent, name, *item);
}

void BuildGet(const Item& payload, Node* root) {
  AddIfType(root, "Object_Type", payload.Find(T::kObjectType), Type::kEnumeration);
  AddIfType(root, "Unique_Identifier", payload.Find(T::kUniqueIdentifier), Type::kTextString);
  const Item* key = payload.Find(T::kSymmetricKey);
  if (key == nullptr || key->type != Type::kStructure) return;
  Node& sym = root->Add("Symmetric_Key", Node::Kind::kStructure);
  const Item* block = key->Find(T::kKeyBlock);
  if (block == nullptr || block->type != Type::kStructure) return;
  AddIfType(&sym, "Format", block->Find(T::kKeyFormatType), Type::kEnumeration);
  AddIfType(&sym, "Algorithm", block->Find(T::kCryptographicAlgorithm), Type::kEnumeration);
  AddIfType(&sym, "Length", block->Find(T::kCryptographicLength), Type::kInteger);
  // Wrapped key material is not the key itself; only plain material is offered.
  if (block->Find(T::kKeyWrappingData) != nullptr) return;
  const Item* value = block->Find(T::kKeyValue);
  if (value == nullptr || value->type != Type::kStructure) return;
  AddIfType(&sym, "Key", value->Find(T::kKeyMaterial), Type::kByteString);
}

void BuildAttributes(const Item& payload, Node* root) {
  AddIfType(root, "Unique_Identifier", payload.Find(T::kUniqueIdentifier), Type::kTextString);
  Node& attrs = root->Add("Attributes", Node::Kind::kStructure);
  for (const Item& a : payload.children) {
    if (a.tag != T::kAttribute || a.type != Type::kStructure) continue;
    const Item* name = a.Find(T::kAttributeName);
    const Item* value = a.Find(T::kAttributeValue);
    if (name == nullptr || name->type != Type::kTextString || value == nullptr) continue;
    std::string n(name->Text());
    for (char& c : n) c = c == ' ' ? '_' : c;
    AddValue(&attrs, n, *value);
  }
}

void BuildVersions(const Item& payload, Node* root) {
  Node* versions = nullptr;
  for (const Item& v : payload.children) {
    if (v.tag != T::kProtocolVersion || v.type != Type::kStructure) continue;
    const Item* major = v.Find(T::kProtocolVersionMajor);
    const Item* minor = v.Find(T::kProtocolVersionMinor);
    if (major == nullptr || minor == nullptr || major->type != Type::kInteger ||
        minor->type != Type::kInteger) {
      continue;
    }
    if (versions == nullptr) versions = &root->Add("Versions", Node::Kind::kStructure);
    std::string text = std::to_string(major->integer) + "." + std::to_string(minor->integer);
    versions->Add("Version", Node::Kind::kText).bytes.assign(text.begin(), text.end());
  }
}

}  // namespace

Groundwork::SecureBytes EncodeRequest(const Request& r) {
  Ttlv::Writer w;
  w.Begin(T::kRequestMessage);
  w.Begin(T::kRequestHeader);
  w.Begin(T::kProtocolVersion);
  w.Integer(T::kProtocolVersionMajor, r.versionMajor);
  w.Integer(T::kProtocolVersionMinor, r.versionMinor);
  w.End();
  if (r.withCredential) {
    w.Begin(T::kAuthentication);
    w.Begin(T::kCredential);
    w.Enumeration(T::kCredentialType, kCredentialUsernamePassword);
    w.Begin(T::kCredentialValue);
    w.Text(T::kUsername, r.username.view());
    w.Text(T::kPassword, r.password.view());
    w.End();
    w.End();
    w.End();
  }
  w.Integer(T::kBatchCount, 1);
  w.End();
  w.Begin(T::kBatchItem);
  w.Enumeration(T::kOperation, static_cast<uint32_t>(r.operation));
  w.Begin(T::kRequestPayload);
  switch (r.operation) {
    case Operation::kGet:
      w.Text(T::kUniqueIdentifier, r.uniqueIdentifier);
      w.Enumeration(T::kKeyFormatType, kKeyFormatRaw);
      break;
    case Operation::kGetAttributes:
      w.Text(T::kUniqueIdentifier, r.uniqueIdentifier);
      for (const std::string& name : r.attributeNames) w.Text(T::kAttributeName, name);
      break;
    case Operation::kDiscoverVersions:
      break;
  }
  w.End();
  w.End();
  w.End();
  return w.Take();
}

bool DecodeResponse(std::span<const uint8_t> message, Operation expected, Response* out,
                    std::string* error) {
  Item root;
  if (!Ttlv::Decode(message, &root, error)) return false;
  if (root.tag != T::kResponseMessage || root.type != Type::kStructure) {
    *error = "invalid KMIP response: not a response message";
    return false;
  }
  const Item *header, *version, *major, *minor, *count;
  if (!Required(root, T::kResponseHeader, Type::kStructure, &header, error, "response header") ||
      !Required(*header, T::kProtocolVersion, Type::kStructure, &version, error,
                "protocol version") ||
      !Required(*version, T::kProtocolVersionMajor, Type::kInteger, &major, error,
                "protocol version major") ||
      !Required(*version, T::kProtocolVersionMinor, Type::kInteger, &minor, error,
                "protocol version minor") ||
      !Required(*header, T::kBatchCount, Type::kInteger, &count, error, "batch count")) {
    return false;
  }
  if (count->integer != 1 || root.Count(T::kBatchItem) != 1) {
    *error = "invalid KMIP response: expected exactly one batch item";
    return false;
  }
  const Item *item, *operation, *status, *reason, *text, *payload;
  if (!Required(root, T::kBatchItem, Type::kStructure, &item, error, "batch item") ||
      !Member(*item, T::kOperation, Type::kEnumeration, &operation, error) ||
      !Required(*item, T::kResultStatus, Type::kEnumeration, &status, error, "result status") ||
      !Member(*item, T::kResultReason, Type::kEnumeration, &reason, error) ||
      !Member(*item, T::kResultMessage, Type::kTextString, &text, error) ||
      !Member(*item, T::kResponsePayload, Type::kStructure, &payload, error)) {
    return false;
  }
  if (operation != nullptr && operation->integer != static_cast<int64_t>(expected)) {
    *error = "invalid KMIP response: it answers operation " + std::to_string(operation->integer) +
             " instead of " + std::to_string(static_cast<uint32_t>(expected));
    return false;
  }
  *out = Response();
  out->resultStatus = static_cast<uint32_t>(status->integer);
  out->resultReason = reason != nullptr ? reason->integer : -1;
  if (text != nullptr) out->resultMessage.assign(text->Text());
  if (payload != nullptr) out->payload = *payload;
  return true;
}

std::string DescribeFailure(const Response& r) {
  std::string text = "operation failed: status " + std::to_string(r.resultStatus) + " (" +
                     StatusName(r.resultStatus) + ")";
  if (r.resultReason >= 0) {
    text += ", reason " + std::to_string(r.resultReason) + " (" + ReasonName(r.resultReason) + ")";
  }
  if (!r.resultMessage.empty()) {
    constexpr size_t kMaxShown = 200;
    std::string shown;
    for (char c : r.resultMessage) {
      if (shown.size() == kMaxShown) break;
      shown.push_back(c >= 0x20 && c < 0x7f ? c : '?');
    }
    text += ", message '" + shown + (r.resultMessage.size() > kMaxShown ? "...'" : "'");
  }
  return text;
}

std::unique_ptr<Tree> BuildTree(Operation operation, const Ttlv::Item& payload) {
  auto tree = std::make_unique<Tree>();
  switch (operation) {
    case Operation::kGet:
      BuildGet(payload, &tree->root);
      break;
    case Operation::kGetAttributes:
      BuildAttributes(payload, &tree->root);
      break;
    case Operation::kDiscoverVersions:
      BuildVersions(payload, &tree->root);
      break;
  }
  tree->Link();
  return tree;
}

}  // namespace Qlc
