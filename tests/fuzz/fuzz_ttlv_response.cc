// Feeds arbitrary bytes to the response decoder as the answer to each
// command, then walks every path the key server client reads.
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>

#include "platform/kmip/messages.h"

namespace {

void Walk(const Qlc::Node& node) {
  for (const Qlc::Node* c = node.children.empty() ? nullptr : &node.children.front(); c;
       c = c->next) {
    Walk(*c);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::span<const uint8_t> bytes(data, size);
  for (Qlc::Operation op :
       {Qlc::Operation::kDiscoverVersions, Qlc::Operation::kGet, Qlc::Operation::kGetAttributes}) {
    Qlc::Response response;
    std::string error;
    if (!Qlc::DecodeResponse(bytes, op, &response, &error)) continue;
    Qlc::DescribeFailure(response);
    auto tree = Qlc::BuildTree(op, response.payload);
    Walk(tree->root);
    for (const char* path : {"Versions", "Versions/", "Symmetric_Key/Key", "Attributes/State"}) {
      Qlc::FindPath(tree->root, path, &error);
    }
  }
  return 0;
}
