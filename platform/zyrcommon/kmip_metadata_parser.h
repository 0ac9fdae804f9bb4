// The wrapped-key text: which master key sealed a data key, and the IV, GCM
// tag and ciphertext of the sealing. It travels through the API as an opaque
// string; its format is described in docs/wrapped-key-format.md:
//
//   zyrwk.v1.<key id>.<iv>.<tag>.<ciphertext>
//
// with each item in URL-safe Base64 without padding. Every item is shorter
// than 65,536 bytes.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace Zyr::KeyProviders::Metadata {

class KmsMetadataParser {
 public:
  virtual ~KmsMetadataParser() = default;
  // Replaces the parsed items with those of `text`. False (and no items) on
  // any malformed, truncated or over-long text.
  virtual bool Parse(std::string_view text) = 0;
};

class KmipMetadataParser final : public KmsMetadataParser {
 public:
  static constexpr size_t kMaxItemSize = 65535;
  // Encoded length of a maximal item, and the longest text Parse accepts:
  // the prefix, four maximal items and their three separators.
  static constexpr size_t kMaxItemTextSize = (kMaxItemSize * 4 + 2) / 3;
  static constexpr size_t kMaxTextSize = 9 + 4 * kMaxItemTextSize + 3;

  // Builds the text for the four items into `text`. False when the key id is
  // empty or any item is longer than kMaxItemSize (`text` is then untouched).
  static bool Add(std::string_view keyId, const std::vector<uint8_t>& iv,
                  const std::vector<uint8_t>& mac, const uint8_t* ciphertext,
                  size_t ciphertextSize, std::string& text);

  bool Parse(std::string_view text) override;

  const uint8_t* GetKeyId() const { return keyId_.data(); }
  uint16_t GetKeyIdSize() const { return static_cast<uint16_t>(keyId_.size()); }
  const uint8_t* GetIv() const { return iv_.data(); }
  uint16_t GetIvSize() const { return static_cast<uint16_t>(iv_.size()); }
  const uint8_t* GetMac() const { return mac_.data(); }
  uint16_t GetMacSize() const { return static_cast<uint16_t>(mac_.size()); }
  const uint8_t* GetCiphertext() const { return ciphertext_.data(); }
  uint16_t GetCiphertextSize() const { return static_cast<uint16_t>(ciphertext_.size()); }

 private:
  void Clear();

  std::vector<uint8_t> keyId_;
  std::vector<uint8_t> iv_;
  std::vector<uint8_t> mac_;
  std::vector<uint8_t> ciphertext_;
};

}  // namespace Zyr::KeyProviders::Metadata
