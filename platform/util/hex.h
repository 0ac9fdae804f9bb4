// Lower-case hexadecimal text of bytes, high nibble first.
#pragma once

#include <string>
#include <string_view>

namespace Groundwork {

// Appends the hex of `bytes` to `out` (any string type; pass a wiping one
// when the bytes are secret).
template <typename String>
void AppendHex(std::string_view bytes, String& out) {
  static constexpr char kDigits[] = "0123456789abcdef";
  out.reserve(out.size() + bytes.size() * 2);
  for (unsigned char c : bytes) {
    out.push_back(kDigits[c >> 4]);
    out.push_back(kDigits[c & 0x0f]);
  }
}

inline std::string HexEncode(std::string_view bytes) {
  std::string out;
  AppendHex(bytes, out);
  return out;
}

}  // namespace Groundwork
