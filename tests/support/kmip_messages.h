// KMIP response messages for the fake KMIP server, and a reader for the
// requests it receives. Built with the library's own TTLV writer; the
// request reader checks the structure independently of the library's
// response decoder.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "platform/kmip/messages.h"
#include "platform/kmip/ttlv.h"
#include "tests/support/loopback_server.h"

namespace ZyrdTest::Kmip {

using Qlc::Operation;
using PayloadWriter = std::function<void(Qlc::Ttlv::Writer&)>;

// A response message with one successful batch item.
std::vector<uint8_t> Success(Operation op, const PayloadWriter& payload);
// A response message whose batch item failed with `reason` and `message`.
std::vector<uint8_t> Failure(Operation op, uint32_t reason, const std::string& message);
// Discover Versions answer listing {major, minor} pairs.
std::vector<uint8_t> Versions(const std::vector<std::pair<int, int>>& versions);
// Get answer holding a raw AES key; without material, a symmetric key whose
// key block has no key value.
std::vector<uint8_t> Key(const std::string& id, const std::vector<uint8_t>& key,
                         bool withMaterial = true);
// Get Attributes answer with the State attribute.
std::vector<uint8_t> State(const std::string& id, int state);

// What a request asked for.
struct SeenRequest {
  bool valid = false;
  Operation operation = Operation::kDiscoverVersions;
  std::string id;
  std::vector<std::string> attributeNames;
  bool hasCredential = false;
  std::string username;
  std::string password;
};
SeenRequest ReadRequest(const std::vector<uint8_t>& request);

// A handler that answers like a key server holding the key `id` with `key`
// in `state`: versions 1.2 and 1.1, Get, Get Attributes; other ids get
// "Item Not Found".
FakeKmipServer::Handler KeyServer(std::string id, std::vector<uint8_t> key, int state);

}  // namespace ZyrdTest::Kmip
