#include "tests/support/kmip_messages.h"

namespace ZyrdTest::Kmip {
namespace {

namespace T = Qlc::Ttlv::Tag;
using Qlc::Ttlv::Item;
using Qlc::Ttlv::Writer;

std::vector<uint8_t> Message(Operation op, uint32_t status, const PayloadWriter& payload,
                             uint32_t reason = 0, const std::string& text = "") {
  Writer w;
  w.Begin(T::kResponseMessage);
  w.Begin(T::kResponseHeader);
  w.Begin(T::kProtocolVersion);
  w.Integer(T::kProtocolVersionMajor, 1);
  w.Integer(T::kProtocolVersionMinor, 1);
  w.End();
  w.DateTime(T::kTimeStamp, 1700000000);
  w.Integer(T::kBatchCount, 1);
  w.End();
  w.Begin(T::kBatchItem);
  w.Enumeration(T::kOperation, static_cast<uint32_t>(op));
  w.Enumeration(T::kResultStatus, status);
  if (status != 0) {
    w.Enumeration(T::kResultReason, reason);
    w.Text(T::kResultMessage, text);
  } else {
    w.Begin(T::kResponsePayload);
    payload(w);
    w.End();
  }
  w.End();
  w.End();
  const auto& bytes = w.bytes();
  return {bytes.begin(), bytes.end()};
}

void KeyBlockStart(Writer& w, const std::string& id) {
  w.Enumeration(T::kObjectType, 2);  // Symmetric Key
  w.Text(T::kUniqueIdentifier, id);
  w.Begin(T::kSymmetricKey);
  w.Begin(T::kKeyBlock);
  w.Enumeration(T::kKeyFormatType, 1);  // Raw
}

}  // namespace

std::vector<uint8_t> Success(Operation op, const PayloadWriter& payload) {
  return Message(op, 0, payload);
}

std::vector<uint8_t> Failure(Operation op, uint32_t reason, const std::string& message) {
  return Message(op, 1, nullptr, reason, message);
}

std::vector<uint8_t> Versions(const std::vector<std::pair<int, int>>& versions) {
  return Success(Operation::kDiscoverVersions, [&](Writer& w) {
    for (auto [major, minor] : versions) {
      w.Begin(T::kProtocolVersion);
      w.Integer(T::kProtocolVersionMajor, major);
      w.Integer(T::kProtocolVersionMinor, minor);
      w.End();
    }
  });
}

std::vector<uint8_t> Key(const std::string& id, const std::vector<uint8_t>& key,
                         bool withMaterial) {
  return Success(Operation::kGet, [&](Writer& w) {
    KeyBlockStart(w, id);
    if (withMaterial) {
      w.Begin(T::kKeyValue);
      w.Bytes(T::kKeyMaterial, key);
      w.End();
    }
    w.Enumeration(T::kCryptographicAlgorithm, 3);  // AES
    if (withMaterial) w.Integer(T::kCryptographicLength, static_cast<int32_t>(key.size() * 8));
    w.End();
    w.End();
  });
}

std::vector<uint8_t> State(const std::string& id, int state) {
  return Success(Operation::kGetAttributes, [&](Writer& w) {
    w.Text(T::kUniqueIdentifier, id);
    w.Begin(T::kAttribute);
    w.Text(T::kAttributeName, "State");
    w.Enumeration(T::kAttributeValue, static_cast<uint32_t>(state));
    w.End();
  });
}

SeenRequest ReadRequest(const std::vector<uint8_t>& request) {
  SeenRequest seen;
  Item root;
  std::string error;
  if (!Qlc::Ttlv::Decode(request, &root, &error) || root.tag != T::kRequestMessage) return seen;
  const Item* header = root.Find(T::kRequestHeader);
  const Item* batch = root.Find(T::kBatchItem);
  if (!header || !batch || !batch->Find(T::kOperation)) return seen;
  if (const Item* auth = header->Find(T::kAuthentication)) {
    const Item* cred = auth->Find(T::kCredential);
    const Item* value = cred ? cred->Find(T::kCredentialValue) : nullptr;
    if (!value || !value->Find(T::kUsername) || !value->Find(T::kPassword)) return seen;
    seen.hasCredential = true;
    seen.username = std::string(value->Find(T::kUsername)->Text());
    seen.password = std::string(value->Find(T::kPassword)->Text());
  }
  seen.operation = static_cast<Operation>(batch->Find(T::kOperation)->integer);
  if (const Item* payload = batch->Find(T::kRequestPayload)) {
    if (const Item* id = payload->Find(T::kUniqueIdentifier)) seen.id = std::string(id->Text());
    for (const Item& c : payload->children) {
      if (c.tag == T::kAttributeName) seen.attributeNames.emplace_back(c.Text());
    }
  }
  seen.valid = true;
  return seen;
}

FakeKmipServer::Handler KeyServer(std::string id, std::vector<uint8_t> key, int state) {
  return [id, key, state](const std::vector<uint8_t>& request) {
    SeenRequest seen = ReadRequest(request);
    FakeReply reply;
    if (!seen.valid) {
      reply.close = true;
    } else if (seen.operation == Operation::kDiscoverVersions) {
      reply.bytes = Versions({{1, 2}, {1, 1}});
    } else if (seen.id != id) {
      reply.bytes = Failure(seen.operation, 1, "Could not locate object: " + seen.id);
    } else if (seen.operation == Operation::kGet) {
      reply.bytes = Key(id, key);
    } else {
      reply.bytes = State(id, state);
    }
    return reply;
  };
}

}  // namespace ZyrdTest::Kmip
