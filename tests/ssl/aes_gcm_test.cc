#include "platform/ssl/aes_gcm.h"

#include <gtest/gtest.h>

#include <set>

#include "tests/support/hex.h"

namespace {

using Kestrel::Common::SslUtils::AesGcmDecrypt;
using Kestrel::Common::SslUtils::AesGcmEncrypt;

std::vector<uint8_t> Key(size_t n) { return std::vector<uint8_t>(n, 0x42); }

struct Sealed {
  std::vector<uint8_t> iv, ct, tag;
};

Sealed Seal(const std::vector<uint8_t>& pt, const std::vector<uint8_t>& key) {
  Sealed s;
  EXPECT_TRUE(AesGcmEncrypt(pt, key, {}, s.iv, s.ct, s.tag));
  return s;
}

// Known answers published with GCM (its test cases 3 and 14): the
// sealing is AES-GCM itself, not merely something that inverts itself.
TEST(AesGcm, KnownAnswers) {
  using ZyrdTest::Unhex;
  const struct {
    const char *key, *iv, *plaintext, *ciphertext, *tag;
  } cases[] = {
      {"feffe9928665731c6d6a8f9467308308", "cafebabefacedbaddecaf888",
       "d9313225f88406e5a55909c5aff5269a86a7a9531534f7da2e4c303d8a318a72"
       "1c3c0c95956809532fcf0e2449a6b525b16aedf5aa0de657ba637b391aafd255",
       "42831ec2217774244b7221b784d0d49ce3aa212f2c02a4e035c17e2329aca12e"
       "21d514b25466931c7d8f6a5aac84aa051ba30b396a0aac973d58e091473f5985",
       "4d5c2af327cd64a62cf35abd2ba6fab4"},
      {"0000000000000000000000000000000000000000000000000000000000000000",
       "000000000000000000000000", "00000000000000000000000000000000",
       "cea7403d4d606b6e074ec5d3baf39d18", "d0d1c8a799996bf0265b98b5d48ab919"},
  };
  for (const auto& c : cases) {
    Groundwork::SecureBytes plain;
    ASSERT_TRUE(
        AesGcmDecrypt(Unhex(c.ciphertext), Unhex(c.key), Unhex(c.iv), {}, Unhex(c.tag), plain));
    EXPECT_EQ(ZyrdTest::Hex(plain), c.plaintext);
  }
}

// Every encryption has a fresh IV; other key lengths fail with empty outputs.
TEST(AesGcm, RoundTripsUnderBothKeySizesOnly) {
  std::set<std::vector<uint8_t>> ivs;
  for (size_t keyLen : {16u, 32u}) {
    for (size_t ptLen : {0u, 1u, 16u, 32u, 1000u}) {
      std::vector<uint8_t> pt(ptLen, 0x5a);
      Sealed s = Seal(pt, Key(keyLen));
      EXPECT_EQ(s.iv.size(), 12u);
      EXPECT_EQ(s.tag.size(), 16u);
      EXPECT_EQ(s.ct.size(), ptLen);
      ivs.insert(s.iv);
      Groundwork::SecureBytes back;
      ASSERT_TRUE(AesGcmDecrypt(s.ct, Key(keyLen), s.iv, {}, s.tag, back))
          << keyLen << "/" << ptLen;
      EXPECT_EQ(std::vector<uint8_t>(back.begin(), back.end()), pt);
    }
  }
  EXPECT_EQ(ivs.size(), 10u);
  std::vector<uint8_t> iv{1}, ct{1}, tag{1};
  for (size_t keyLen : {0u, 15u, 24u, 33u}) {
    EXPECT_FALSE(AesGcmEncrypt(std::vector<uint8_t>(4), Key(keyLen), {}, iv, ct, tag)) << keyLen;
    EXPECT_TRUE(iv.empty() && ct.empty() && tag.empty());
  }
}

TEST(AesGcm, AnyChangedBitFailsAuthentication) {
  auto key = Key(32);
  std::vector<uint8_t> pt(32, 0x11);
  Sealed s = Seal(pt, key);
  auto flipEach = [&](std::vector<uint8_t>& field) {
    for (size_t i = 0; i < field.size() * 8; ++i) {
      field[i / 8] ^= static_cast<uint8_t>(1u << (i % 8));
      Groundwork::SecureBytes out{9};
      EXPECT_FALSE(AesGcmDecrypt(s.ct, key, s.iv, {}, s.tag, out)) << i;
      EXPECT_TRUE(out.empty());
      field[i / 8] ^= static_cast<uint8_t>(1u << (i % 8));
    }
  };
  flipEach(s.ct);
  flipEach(s.iv);
  flipEach(s.tag);

  Groundwork::SecureBytes out;
  EXPECT_FALSE(AesGcmDecrypt(s.ct, Key(16), s.iv, {}, s.tag, out));  // wrong key
  std::vector<uint8_t> aad{1};
  EXPECT_FALSE(AesGcmDecrypt(s.ct, key, s.iv, aad, s.tag, out));  // unexpected aad
  std::vector<uint8_t> shortTag(s.tag.begin(), s.tag.begin() + 12);
  EXPECT_FALSE(AesGcmDecrypt(s.ct, key, s.iv, {}, shortTag, out));  // truncated tag
  EXPECT_TRUE(AesGcmDecrypt(s.ct, key, s.iv, {}, s.tag, out));
}

}  // namespace
