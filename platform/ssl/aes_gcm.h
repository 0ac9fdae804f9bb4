// AES-GCM sealing of data keys under a master key.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "platform/util/secure_buffer.h"

namespace Kestrel::Common::SslUtils {

inline constexpr size_t kAesGcmIvLength = 12;
inline constexpr size_t kAesGcmTagLength = 16;

// Encrypts `plaintext` with AES-128-GCM or AES-256-GCM, chosen by the key's
// length (16 or 32 bytes; any other length fails), under a fresh random
// 12-byte IV, authenticating `aad` as well. Fills `iv`, `ciphertext` (as long
// as the plaintext) and the 16-byte `tag`. False on any failure, with the
// outputs emptied.
bool AesGcmEncrypt(std::span<const uint8_t> plaintext, std::span<const uint8_t> key,
                   std::span<const uint8_t> aad, std::vector<uint8_t>& iv,
                   std::vector<uint8_t>& ciphertext, std::vector<uint8_t>& tag);

// The inverse. True only when the key is 16 or 32 bytes, the IV 12 and the
// tag 16 bytes, and the tag verifies; `plaintext` is emptied (and its memory
// wiped) on every failure.
bool AesGcmDecrypt(std::span<const uint8_t> ciphertext, std::span<const uint8_t> key,
                   std::span<const uint8_t> iv, std::span<const uint8_t> aad,
                   std::span<const uint8_t> tag, Groundwork::SecureBytes& plaintext);

}  // namespace Kestrel::Common::SslUtils
