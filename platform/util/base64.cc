#include "platform/util/base64.h"

#include <array>

#include "platform/util/secure_buffer.h"

namespace {

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

constexpr std::array<int8_t, 256> MakeReverse() {
  std::array<int8_t, 256> table{};
  for (auto& v : table) v = -1;
  for (int i = 0; i < 64; ++i) table[static_cast<uint8_t>(kAlphabet[i])] = static_cast<int8_t>(i);
  return table;
}

constexpr auto kReverse = MakeReverse();

}  // namespace

size_t Base64_EncodedLength(const uint8_t*, size_t length) { return (length + 2) / 3 * 4 + 1; }

bool Base64_Encode(const uint8_t* src, size_t length, char* dst, size_t dstSize,
                   size_t* dstLength) {
  size_t needed = Base64_EncodedLength(src, length);
  if (dst == nullptr || dstSize < needed) return false;
  size_t o = 0;
  size_t i = 0;
  for (; i + 3 <= length; i += 3) {
    uint32_t v = (uint32_t{src[i]} << 16) | (uint32_t{src[i + 1]} << 8) | src[i + 2];
    dst[o++] = kAlphabet[(v >> 18) & 63];
    dst[o++] = kAlphabet[(v >> 12) & 63];
    dst[o++] = kAlphabet[(v >> 6) & 63];
    dst[o++] = kAlphabet[v & 63];
  }
  if (size_t rest = length - i; rest > 0) {
    uint32_t v = uint32_t{src[i]} << 16;
    if (rest == 2) v |= uint32_t{src[i + 1]} << 8;
    dst[o++] = kAlphabet[(v >> 18) & 63];
    dst[o++] = kAlphabet[(v >> 12) & 63];
    dst[o++] = rest == 2 ? kAlphabet[(v >> 6) & 63] : '=';
    dst[o++] = '=';
  }
  dst[o] = '\0';
  if (dstLength != nullptr) *dstLength = o;
  return true;
}

namespace {

template <typename Bytes>
bool DecodeStandard(std::string_view text, Bytes* out) {
  out->clear();
  if (text.size() % 4 != 0) return false;
  out->reserve(text.size() / 4 * 3);
  for (size_t i = 0; i < text.size(); i += 4) {
    bool last = i + 4 == text.size();
    int v[4];
    int pad = 0;
    for (int k = 0; k < 4; ++k) {
      char c = text[i + k];
      if (c == '=' && last && k >= 2) {
        v[k] = 0;
        ++pad;
        continue;
      }
      if (pad > 0) return false;  // data after padding
      v[k] = kReverse[static_cast<uint8_t>(c)];
      if (v[k] < 0) return false;
    }
    uint32_t w = (uint32_t(v[0]) << 18) | (uint32_t(v[1]) << 12) | (uint32_t(v[2]) << 6) | v[3];
    out->push_back(static_cast<uint8_t>(w >> 16));
    if (pad < 2) out->push_back(static_cast<uint8_t>(w >> 8));
    if (pad < 1) out->push_back(static_cast<uint8_t>(w));
  }
  return true;
}

}  // namespace

bool Base64_Decode(std::string_view text, std::vector<uint8_t>* out) {
  return DecodeStandard(text, out);
}

bool Base64_Decode(std::string_view text, Groundwork::SecureBytes* out) {
  return DecodeStandard(text, out);
}

namespace Groundwork {

SecureString Base64EncodeSecret(const uint8_t* src, size_t length) {
  SecureString text;
  text.str().resize(Base64_EncodedLength(src, length));
  size_t used = 0;
  Base64_Encode(src, length, text.data(), text.size(), &used);
  text.str().resize(used);
  return text;
}

namespace {

constexpr char kUrlAlphabet[] =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";

constexpr std::array<int8_t, 256> MakeUrlReverse() {
  std::array<int8_t, 256> table{};
  for (auto& v : table) v = -1;
  for (int i = 0; i < 64; ++i) table[static_cast<uint8_t>(kUrlAlphabet[i])] = static_cast<int8_t>(i);
  return table;
}

constexpr auto kUrlReverse = MakeUrlReverse();

}  // namespace

void Base64UrlEncode(const uint8_t* src, size_t length, std::string& out) {
  out.reserve(out.size() + (length * 4 + 2) / 3);
  size_t i = 0;
  for (; i + 3 <= length; i += 3) {
    uint32_t v = (uint32_t{src[i]} << 16) | (uint32_t{src[i + 1]} << 8) | src[i + 2];
    out.push_back(kUrlAlphabet[(v >> 18) & 63]);
    out.push_back(kUrlAlphabet[(v >> 12) & 63]);
    out.push_back(kUrlAlphabet[(v >> 6) & 63]);
    out.push_back(kUrlAlphabet[v & 63]);
  }
  size_t rest = length - i;
  if (rest == 0) return;
  uint32_t v = uint32_t{src[i]} << 16;
  if (rest == 2) v |= uint32_t{src[i + 1]} << 8;
  out.push_back(kUrlAlphabet[(v >> 18) & 63]);
  out.push_back(kUrlAlphabet[(v >> 12) & 63]);
  if (rest == 2) out.push_back(kUrlAlphabet[(v >> 6) & 63]);
}

template <typename Bytes>
bool Base64UrlDecode(std::string_view text, Bytes& out) {
  out.clear();
  if (text.size() % 4 == 1) return false;
  out.reserve(text.size() / 4 * 3 + 2);
  uint32_t acc = 0;
  int bits = 0;
  for (char c : text) {
    int8_t v = kUrlReverse[static_cast<uint8_t>(c)];
    if (v < 0) return false;
    acc = (acc << 6) | static_cast<uint32_t>(v);
    bits += 6;
    if (bits >= 8) {
      bits -= 8;
      out.push_back(static_cast<uint8_t>(acc >> bits));
      acc &= (1u << bits) - 1;
    }
  }
  // Unused low bits of the last character must be zero.
  return acc == 0;
}

template bool Base64UrlDecode(std::string_view, std::vector<uint8_t>&);
template bool Base64UrlDecode(std::string_view, SecureBytes&);

}  // namespace Groundwork
