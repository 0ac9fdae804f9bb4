#include "platform/ssl/gzip.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using Groundwork::SecureString;
using namespace Kestrel::Common::Gzip;

std::string Compress(const std::string& text) {
  SecureString gz;
  EXPECT_TRUE(CompressFromString(text, gz));
  return std::string(gz.view());
}

// Decompresses or returns "refused: <reason>".
std::string Inflate(std::string_view gz, size_t maxSize = kDefaultMaxDecompressedSize) {
  SecureString out("stale");
  std::string reason;
  if (DecompressToString(gz, out, maxSize, &reason)) return std::string(out.view());
  EXPECT_TRUE(out.empty());
  return "refused: " + reason;
}

TEST(GzipTest, RoundTripsAndReadsConcatenatedMembers) {
  std::string text(100000, 'x');
  for (size_t i = 0; i < text.size(); i += 7) text[i] = static_cast<char>(i);
  const std::string gz = Compress(text);
  EXPECT_EQ(gz.substr(0, 2), "\x1f\x8b");
  EXPECT_EQ(Inflate(gz), text);
  EXPECT_EQ(Inflate(Compress("")), "");
  EXPECT_EQ(Inflate(Compress("one ") + Compress("two")), "one two");
}

TEST(GzipTest, RefusesWhatIsNotCompleteGzipData) {
  const std::string gz = Compress("some configuration text");
  for (size_t cut = 0; cut < gz.size(); ++cut) {
    EXPECT_EQ(Inflate(gz.substr(0, cut)).rfind("refused: ", 0), 0u) << cut;
  }
  EXPECT_EQ(Inflate(gz + "junk"), "refused: not gzip data");
  EXPECT_EQ(Inflate("plain text"), "refused: not gzip data");
}

TEST(GzipTest, StopsAtTheSizeLimit) {
  const std::string gz = Compress(std::string(4096, '\0'));
  EXPECT_EQ(Inflate(gz, 4096).size(), 4096u);
  EXPECT_EQ(Inflate(gz, 4095), "refused: the text exceeds the size limit");
  EXPECT_EQ(Inflate(Compress("a") + Compress("b"), 1), "refused: the text exceeds the size limit");
}

}  // namespace
