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

TEST(WrappedKeyText, RoundTripsEveryItemExactly) {
  for (size_t ctSize : {0u, 1u, 2u, 3u, 16u, 32u, 65535u}) {
    auto iv = Bytes(12, 1);
    auto tag = Bytes(16, 40);
    auto ct = Bytes(ctSize, 7);
    std::string keyId = "a1b2-c3d4." + std::to_string(ctSize);
    std::string text = Wrap(keyId, iv, tag, ct);

    KmipMetadataParser parser;
    ASSERT_TRUE(parser.Parse(text)) << ctSize;
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(parser.GetKeyId()), parser.GetKeyIdSize()),
              keyId);
    EXPECT_EQ(Item(parser.GetIv(), parser.GetIvSize()), iv);
    EXPECT_EQ(Item(parser.GetMac(), parser.GetMacSize()), tag);
    EXPECT_EQ(Item(parser.GetCiphertext(), parser.GetCiphertextSize()), ct);
  }
}

TEST(WrappedKeyText, IsVersionedAndPlainText) {
  std::string text = Wrap("k", {1}, {2}, {3});
  EXPECT_EQ(text, "zyrwk.v1.aw.AQ.Ag.Aw");
}

TEST(WrappedKeyText, AddRefusesItemsOfSixtyFourKiBOrMore) {
  std::string text = "unchanged";
  auto big = Bytes(65536, 0);
  EXPECT_FALSE(KmipMetadataParser::Add("k", Bytes(12, 0), Bytes(16, 0), big.data(), big.size(),
                                       text));
  EXPECT_FALSE(KmipMetadataParser::Add(std::string(65536, 'k'), Bytes(12, 0), Bytes(16, 0),
                                       nullptr, 0, text));
  EXPECT_FALSE(KmipMetadataParser::Add("", Bytes(12, 0), Bytes(16, 0), nullptr, 0, text));
  EXPECT_EQ(text, "unchanged");
}

TEST(WrappedKeyText, RejectsMalformedTexts) {
  const char* bad[] = {
      "",
      "zyrwk.v1.",
      "zyrwk.v2.aw.AQ.Ag.Aw",      // unknown version
      "ZYRWK.v1.aw.AQ.Ag.Aw",      // prefix is case-sensitive
      "zyrwk.v1.aw.AQ.Ag",         // missing item
      "zyrwk.v1.aw.AQ.Ag.Aw.AA",   // extra item
      "zyrwk.v1..AQ.Ag.Aw",        // empty key id
      "zyrwk.v1.aw..Ag.Aw",        // empty iv
      "zyrwk.v1.aw.AQ..Aw",        // empty tag
      "zyrwk.v1.aw.AQ.Ag.A",       // impossible Base64 length
      "zyrwk.v1.aw.AQ.Ag.Ax",      // non-zero unused bits
      "zyrwk.v1.aw.AQ==.Ag.Aw",    // padding is not used
      "zyrwk.v1.aw.A+.Ag.Aw",      // standard, not URL-safe, alphabet
      "zyrwk.v1.aw.AQ.Ag.Aw\n",    // trailing garbage
  };
  for (const char* text : bad) {
    KmipMetadataParser parser;
    EXPECT_FALSE(parser.Parse(text)) << text;
    EXPECT_EQ(parser.GetKeyIdSize(), 0) << text;
  }
}

TEST(WrappedKeyText, EveryTruncationIsRejected) {
  std::string text = Wrap("master-key-1", Bytes(12, 3), Bytes(16, 9), Bytes(32, 5));
  KmipMetadataParser parser;
  for (size_t n = 0; n < text.size(); ++n) {
    std::string cut = text.substr(0, n);
    // A cut that ends on a complete ciphertext group still parses only when it
    // is a whole, canonical text; otherwise it must fail.
    if (parser.Parse(cut)) {
      EXPECT_NE(Item(parser.GetCiphertext(), parser.GetCiphertextSize()), Bytes(32, 5)) << n;
    }
  }
  EXPECT_TRUE(parser.Parse(text));
}

TEST(WrappedKeyText, OversizedItemsAndTextsAreRejectedWithoutDecoding) {
  KmipMetadataParser parser;
  std::string hugeItem(KmipMetadataParser::kMaxItemTextSize + 4, 'A');
  EXPECT_FALSE(parser.Parse("zyrwk.v1.aw.AQ.Ag." + hugeItem));
  EXPECT_FALSE(parser.Parse(std::string(KmipMetadataParser::kMaxTextSize + 1, 'z')));
}

TEST(WrappedKeyText, AFailedParseClearsEarlierItems) {
  KmipMetadataParser parser;
  ASSERT_TRUE(parser.Parse(Wrap("k", {1}, {2}, {3})));
  EXPECT_FALSE(parser.Parse("zyrwk.v1.aw.AQ.Ag"));
  EXPECT_EQ(parser.GetKeyIdSize(), 0);
  EXPECT_EQ(parser.GetCiphertextSize(), 0);
}

}  // namespace
