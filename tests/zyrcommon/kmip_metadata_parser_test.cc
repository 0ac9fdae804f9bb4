#include "platform/zyrcommon/kmip_metadata_parser.h"

#include <gtest/gtest.h>

#include <numeric>

namespace {

using Zyr::KeyProviders::Metadata::KmipMetadataParser;

std::vector<uint8_t> Bytes(size_t n, uint8_t seed) {
  std::vector<uint8_t> v(n);
  std::iota(v.begin(), v.end(), seed);
  return v;
}

std::string Wrap(std::string_view keyId, const std::vector<uint8_t>& iv,
                 const std::vector<uint8_t>& tag, const std::vector<uint8_t>& ct) {
  std::string text;
  EXPECT_TRUE(KmipMetadataParser::Add(keyId, iv, tag, ct.data(), ct.size(), text));
  return text;
}

std::vector<uint8_t> Item(const uint8_t* p, uint16_t n) { return {p, p + n}; }

TEST(WrappedKeyText, IsVersionedAndRoundTripsEveryItemExactly) {
  EXPECT_EQ(Wrap("k", {1}, {2}, {3}), "zyrwk.v1.aw.AQ.Ag.Aw");
  for (size_t ctSize : {0u, 1u, 2u, 3u, 16u, 32u, 65535u}) {
    auto iv = Bytes(12, 1), tag = Bytes(16, 40), ct = Bytes(ctSize, 7);
    std::string keyId = "a1b2-c3d4." + std::to_string(ctSize);
    KmipMetadataParser parser;
    ASSERT_TRUE(parser.Parse(Wrap(keyId, iv, tag, ct))) << ctSize;
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(parser.GetKeyId()), parser.GetKeyIdSize()),
              keyId);
    EXPECT_EQ(Item(parser.GetIv(), parser.GetIvSize()), iv);
    EXPECT_EQ(Item(parser.GetMac(), parser.GetMacSize()), tag);
    EXPECT_EQ(Item(parser.GetCiphertext(), parser.GetCiphertextSize()), ct);
  }
}

TEST(WrappedKeyText, ItemsOfSixtyFourKiBOrMoreAreRefusedBothWays) {
  std::string text = "unchanged";
  auto big = Bytes(65536, 0);
  EXPECT_FALSE(
      KmipMetadataParser::Add("k", Bytes(12, 0), Bytes(16, 0), big.data(), big.size(), text));
  EXPECT_FALSE(KmipMetadataParser::Add(std::string(65536, 'k'), Bytes(12, 0), Bytes(16, 0), nullptr,
                                       0, text));
  EXPECT_FALSE(KmipMetadataParser::Add("", Bytes(12, 0), Bytes(16, 0), nullptr, 0, text));
  EXPECT_EQ(text, "unchanged");
  // Oversized items and texts are rejected without decoding.
  KmipMetadataParser parser;
  EXPECT_FALSE(parser.Parse("zyrwk.v1.aw.AQ.Ag." +
                            std::string(KmipMetadataParser::kMaxItemTextSize + 4, 'A')));
  EXPECT_FALSE(parser.Parse(std::string(KmipMetadataParser::kMaxTextSize + 1, 'z')));
}

// A failed parse also clears what an earlier one read.
TEST(WrappedKeyText, RejectsMalformedTexts) {
  const char* bad[] = {
      "",
      "zyrwk.v1.",
      "zyrwk.v2.aw.AQ.Ag.Aw",     // unknown version
      "ZYRWK.v1.aw.AQ.Ag.Aw",     // prefix is case-sensitive
      "zyrwk.v1.aw.AQ.Ag",        // missing item
      "zyrwk.v1.aw.AQ.Ag.Aw.AA",  // extra item
      "zyrwk.v1..AQ.Ag.Aw",       // empty key id
      "zyrwk.v1.aw..Ag.Aw",       // empty iv
      "zyrwk.v1.aw.AQ..Aw",       // empty tag
      "zyrwk.v1.aw.AQ.Ag.A",      // impossible Base64 length
      "zyrwk.v1.aw.AQ.Ag.Ax",     // non-zero unused bits
      "zyrwk.v1.aw.AQ==.Ag.Aw",   // padding is not used
      "zyrwk.v1.aw.A+.Ag.Aw",     // standard, not URL-safe, alphabet
      "zyrwk.v1.aw.AQ.Ag.Aw\n",   // trailing garbage
  };
  for (const char* text : bad) {
    KmipMetadataParser parser;
    ASSERT_TRUE(parser.Parse("zyrwk.v1.aw.AQ.Ag.Aw"));
    EXPECT_FALSE(parser.Parse(text)) << text;
    EXPECT_EQ(parser.GetKeyIdSize() + parser.GetCiphertextSize(), 0) << text;
  }
}

// A cut that ends on a complete ciphertext group may still parse as a shorter
// canonical text, but never as the original.
// A text cut anywhere up to the ciphertext is refused; cut within the
// ciphertext it may still parse (the tag then refuses it), but never with a
// key id, IV or tag other than the ones it was made with.
TEST(WrappedKeyText, TruncationsNeverYieldOtherKeyMaterialNames) {
  const std::string text = Wrap("master-key-1", Bytes(12, 3), Bytes(16, 9), Bytes(32, 5));
  const size_t ciphertextStart = text.rfind('.') + 1;
  KmipMetadataParser parser;
  size_t parsed = 0;
  for (size_t n = 0; n < text.size(); ++n) {
    if (!parser.Parse(text.substr(0, n))) continue;
    ++parsed;
    EXPECT_GE(n, ciphertextStart);
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(parser.GetKeyId()), parser.GetKeyIdSize()),
              "master-key-1");
    EXPECT_EQ(Item(parser.GetIv(), parser.GetIvSize()), Bytes(12, 3));
    EXPECT_EQ(Item(parser.GetMac(), parser.GetMacSize()), Bytes(16, 9));
    EXPECT_LT(parser.GetCiphertextSize(), 32u);
  }
  EXPECT_GT(parsed, 0u);  // some shorter ciphertexts are well-formed
}

}  // namespace
