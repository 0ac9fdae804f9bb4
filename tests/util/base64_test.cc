#include "platform/util/base64.h"

#include <gtest/gtest.h>

namespace {

std::string Encode(std::string_view in) {
  const auto* p = reinterpret_cast<const uint8_t*>(in.data());
  std::string out(Base64_EncodedLength(p, in.size()), '?');
  size_t len = 0;
  EXPECT_TRUE(Base64_Encode(p, in.size(), out.data(), out.size(), &len));
  EXPECT_EQ(out[len], '\0');
  out.resize(len);
  return out;
}

TEST(Base64, KnownVectorsAndEveryLengthRoundTrips) {
  EXPECT_EQ(Encode("f"), "Zg==");
  EXPECT_EQ(Encode("fo"), "Zm8=");
  EXPECT_EQ(Encode("foobar"), "Zm9vYmFy");
  EXPECT_EQ(Encode(std::string("\xff\xfe\x00", 3)), "//4A");
  std::string data;
  for (int n = 0; n < 70; ++n, data.push_back(static_cast<char>(n * 37 + 11))) {
    std::vector<uint8_t> back;
    ASSERT_TRUE(Base64_Decode(Encode(data), &back)) << n;
    EXPECT_EQ(std::string(back.begin(), back.end()), data);
  }
}

TEST(Base64, RefusesSmallBuffersAndMalformedText) {
  const uint8_t in[3] = {1, 2, 3};
  char out[4];
  EXPECT_FALSE(Base64_Encode(in, 3, out, sizeof out, nullptr));
  std::vector<uint8_t> decoded;
  for (const char* bad : {"Zg=", "Zg=a", "Z===", "Zm9v!A==", "=Zm9", "Zg==Zg==", "Zm 9v"}) {
    EXPECT_FALSE(Base64_Decode(bad, &decoded)) << bad;
  }
}

}  // namespace
