// Hexadecimal texts of byte sequences, for expectations and test data.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace ZyrdTest {

// Lower-case hex of any sequence of chars or bytes.
template <typename Bytes>
std::string Hex(const Bytes& bytes) {
  static const char* digits = "0123456789abcdef";
  std::string out;
  for (auto c : bytes) {
    out.push_back(digits[static_cast<uint8_t>(c) >> 4]);
    out.push_back(digits[static_cast<uint8_t>(c) & 15]);
  }
  return out;
}

// The bytes of a hex text; spaces are skipped.
inline std::vector<uint8_t> Unhex(std::string_view hex) {
  std::string digits;
  for (char c : hex) {
    if (c != ' ') digits.push_back(c);
  }
  std::vector<uint8_t> out;
  for (size_t i = 0; i + 1 < digits.size(); i += 2) {
    out.push_back(static_cast<uint8_t>(std::stoi(digits.substr(i, 2), nullptr, 16)));
  }
  return out;
}

}  // namespace ZyrdTest
