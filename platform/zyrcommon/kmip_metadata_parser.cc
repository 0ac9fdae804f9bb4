#include "platform/zyrcommon/kmip_metadata_parser.h"

#include <array>

#include "platform/util/base64.h"

namespace Zyr::KeyProviders::Metadata {
namespace {

constexpr std::string_view kPrefix = "zyrwk.v1.";

// One item: non-empty unless `mayBeEmpty`, below the size limit, canonical
// URL-safe Base64.
bool DecodeItem(std::string_view text, bool mayBeEmpty, std::vector<uint8_t>& out) {
  if (text.size() > KmipMetadataParser::kMaxItemTextSize) return false;
  if (!Groundwork::Base64UrlDecode(text, out)) return false;
  if (out.empty() && !mayBeEmpty) return false;
  return out.size() <= KmipMetadataParser::kMaxItemSize;
}

}  // namespace

bool KmipMetadataParser::Add(std::string_view keyId, const std::vector<uint8_t>& iv,
                             const std::vector<uint8_t>& mac, const uint8_t* ciphertext,
                             size_t ciphertextSize, std::string& text) {
  if (keyId.empty() || keyId.size() > kMaxItemSize || iv.empty() || iv.size() > kMaxItemSize ||
      mac.empty() || mac.size() > kMaxItemSize || ciphertextSize > kMaxItemSize ||
      (ciphertext == nullptr && ciphertextSize != 0)) {
    return false;
  }
  std::string out(kPrefix);
  Groundwork::Base64UrlEncode(reinterpret_cast<const uint8_t*>(keyId.data()), keyId.size(), out);
  out.push_back('.');
  Groundwork::Base64UrlEncode(iv.data(), iv.size(), out);
  out.push_back('.');
  Groundwork::Base64UrlEncode(mac.data(), mac.size(), out);
  out.push_back('.');
  Groundwork::Base64UrlEncode(ciphertext, ciphertextSize, out);
  text = std::move(out);
  return true;
}

bool KmipMetadataParser::Parse(std::string_view text) {
  Clear();
  if (text.size() > kMaxTextSize || text.substr(0, kPrefix.size()) != kPrefix) return false;
  text.remove_prefix(kPrefix.size());

  std::array<std::string_view, 4> items;
  for (size_t i = 0; i < items.size(); ++i) {
    size_t dot = text.find('.');
    bool last = i + 1 == items.size();
    if (last != (dot == std::string_view::npos)) return false;  // too few or too many items
    items[i] = text.substr(0, dot);
    if (!last) text.remove_prefix(dot + 1);
  }
  if (!DecodeItem(items[0], false, keyId_) || !DecodeItem(items[1], false, iv_) ||
      !DecodeItem(items[2], false, mac_) || !DecodeItem(items[3], true, ciphertext_)) {
    Clear();
    return false;
  }
  return true;
}

void KmipMetadataParser::Clear() {
  keyId_.clear();
  iv_.clear();
  mac_.clear();
  ciphertext_.clear();
}

}  // namespace Zyr::KeyProviders::Metadata
