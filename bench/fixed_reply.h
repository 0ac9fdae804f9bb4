// The reply both benchmark servers send: about the size of a generate_key
// result.
#pragma once

#include <string_view>

namespace ZyrdBench {

inline constexpr std::string_view kFixedReply =
    R"({"jsonrpc":"2.0","id":1,"result":{"output":{"wrappedKey":")"
    R"(AAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAA)"
    R"(AAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAA",)"
    R"("key":"AAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAA="}}})";

}  // namespace ZyrdBench
