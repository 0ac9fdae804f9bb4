// ASCII-only, locale-free text helpers for protocol tokens (header names,
// media types): cheap enough for every request, unlike locale-aware ones.
#pragma once

#include <string_view>

namespace Groundwork {

constexpr char AsciiLower(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; }

constexpr bool AsciiIEquals(std::string_view a, std::string_view b) {
  if (a.size() != b.size()) return false;
  for (size_t i = 0; i < a.size(); ++i) {
    if (AsciiLower(a[i]) != AsciiLower(b[i])) return false;
  }
  return true;
}

// Whether `needle` occurs in `haystack`, ignoring ASCII letter case.
constexpr bool AsciiIContains(std::string_view haystack, std::string_view needle) {
  if (needle.size() > haystack.size()) return false;
  for (size_t i = 0; i + needle.size() <= haystack.size(); ++i) {
    if (AsciiIEquals(haystack.substr(i, needle.size()), needle)) return true;
  }
  return false;
}

}  // namespace Groundwork
