#include "platform/ssl/aes_gcm.h"

#include <gtest/gtest.h>

#include <set>

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
