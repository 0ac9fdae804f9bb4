// KMIP 1.1 request and response messages for the commands this library
// offers, as pure functions over bytes:
//   Discover Versions  ("Query, Versions")      -> "Versions/" texts "major.minor"
//   Get, Raw key format ("Get, Object, Id=...")  -> "Symmetric_Key/Key" bytes, and
//                                                  ".../Format", ".../Algorithm",
//                                                  ".../Length", "Object_Type",
//                                                  "Unique_Identifier"
//   Get Attributes      ("Get, Attributes, ...") -> "Attributes/<name>" with blanks
//                                                  in the name written as '_'
//                                                  ("Attributes/State")
// A request may carry a Username and Password credential in its header.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "platform/kmip/response_tree.h"
#include "platform/kmip/ttlv.h"
#include "platform/util/secure_buffer.h"

namespace Qlc {

enum class Operation : uint32_t {
  kGet = 0x0A,
  kGetAttributes = 0x0B,
  kDiscoverVersions = 0x1E,
};

struct Request {
  Operation operation = Operation::kDiscoverVersions;
  int versionMajor = 1;
  int versionMinor = 1;
  std::string uniqueIdentifier;             // Get, Get Attributes
  std::vector<std::string> attributeNames;  // Get Attributes; empty asks for all
  bool withCredential = false;
  Groundwork::SecureString username;
  Groundwork::SecureString password;
};

// One-item request message for `request`.
Groundwork::SecureBytes EncodeRequest(const Request& request);

// Result status values of a batch item.
inline constexpr uint32_t kResultSuccess = 0;

struct Response {
  uint32_t resultStatus = 0;
  int64_t resultReason = -1;  // -1 when the server gave none
  std::string resultMessage;
  Ttlv::Item payload;  // an empty structure when the server sent none
};

// Checks a whole response message (header, one batch item answering
// `expected`) and extracts its result and payload. False with `error` set
// when the bytes are not such a message.
bool DecodeResponse(std::span<const uint8_t> message, Operation expected, Response* out,
                    std::string* error);

// "operation failed: status 1 (Operation Failed), reason 1 (Item Not Found),
// message '...'", with the server's message cut to printable ASCII.
std::string DescribeFailure(const Response& response);

// The path tree of a successful response's payload.
std::unique_ptr<Tree> BuildTree(Operation operation, const Ttlv::Item& payload);

}  // namespace Qlc
