// Wrapped-key texts come back from API callers: parsing must never crash or
// read past its input, and whatever parses must re-encode to the same text.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "platform/zyrcommon/kmip_metadata_parser.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using Zyr::KeyProviders::Metadata::KmipMetadataParser;
  std::string text(reinterpret_cast<const char*>(data), size);
  KmipMetadataParser parser;
  if (!parser.Parse(text)) return 0;
  std::string again;
  std::string keyId(reinterpret_cast<const char*>(parser.GetKeyId()), parser.GetKeyIdSize());
  std::vector<uint8_t> iv(parser.GetIv(), parser.GetIv() + parser.GetIvSize());
  std::vector<uint8_t> mac(parser.GetMac(), parser.GetMac() + parser.GetMacSize());
  if (!KmipMetadataParser::Add(keyId, iv, mac, parser.GetCiphertext(),
                               parser.GetCiphertextSize(), again) ||
      again != text) {
    abort();
  }
  return 0;
}
