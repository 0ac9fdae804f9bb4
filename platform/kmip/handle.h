// The common head of every object the C surface hands out as a result or a
// node, so that a function taking either can tell which it was given.
#pragma once

#include <cstdint>

struct qlc_handle {
  uint32_t magic;
};

namespace Qlc {
inline constexpr uint32_t kResultMagic = 0x716c6352;  // "qlcR"
inline constexpr uint32_t kNodeMagic = 0x716c634e;    // "qlcN"
}  // namespace Qlc
