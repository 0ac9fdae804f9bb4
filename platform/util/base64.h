// Standard Base64 (RFC 4648, with padding, no line breaks).
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/util/secure_buffer.h"

// Size of the buffer that Base64_Encode needs for `length` input bytes,
// including the terminating NUL.
size_t Base64_EncodedLength(const uint8_t* src, size_t length);

// Encodes `length` bytes of `src` into `dst` (NUL-terminated). Returns false
// when `dstSize` is too small. `dstLength`, when given, receives the length
// without the NUL.
bool Base64_Encode(const uint8_t* src, size_t length, char* dst, size_t dstSize,
                   size_t* dstLength);

// Decodes standard Base64 text; false on any character outside the alphabet,
// bad padding or a length that is not a multiple of four.
bool Base64_Decode(std::string_view text, std::vector<uint8_t>* out);
// The same into a buffer that wipes itself (for secrets).
bool Base64_Decode(std::string_view text, Groundwork::SecureBytes* out);

namespace Groundwork {

// Standard Base64 of secret bytes, in a string that wipes itself.
SecureString Base64EncodeSecret(const uint8_t* src, size_t length);

// URL-safe Base64 without padding ('-' and '_' for '+' and '/'), appended to
// `out`.
void Base64UrlEncode(const uint8_t* src, size_t length, std::string& out);

// Strict inverse of Base64UrlEncode: false on any character outside the
// URL-safe alphabet, padding, a length of 1 modulo 4, or non-zero unused bits
// in the last character (so every byte string has exactly one encoding).
// `out` is replaced.
template <typename Bytes>
bool Base64UrlDecode(std::string_view text, Bytes& out);

}  // namespace Groundwork
