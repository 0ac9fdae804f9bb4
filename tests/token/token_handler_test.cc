#include "platform/token/token_handler.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <fstream>

#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace {

using Orna::Authn::TokenHandler;
using ZyrdTest::ReadFile;

// "root @ORNA+KMS_ADMIN" when `handler` accepts `token`, "none" when it
// passes the call on.
std::string Outcome(TokenHandler& handler, const std::string& token) {
  Lumo::Core::AsyncActivation activation;
  if (!token.empty()) {
    activation.securityContext.scheme = Lumo::Core::SecurityContext::kOAuthScheme;
    activation.securityContext.accessToken.assign(token);
  }
  std::string out = "(not completed)";
  handler.Authenticate(activation, [&](Lumo::Authn::AuthnOutcome o) {
    if (o.error)
      out = "error";
    else if (!o.result)
      out = "none";
    else
      out = o.result->username + " " + o.result->entitlements.at(0);
  });
  return out;
}

mode_t Mode(const std::string& path) {
  struct stat st;
  stat(path.c_str(), &st);
  return st.st_mode & 0777;
}

TEST(TokenHandlerTest, FirstStartCreatesAPrivateTokenThatLaterStartsReuse) {
  ZyrdTest::TempDir tmp;
  std::string path = tmp / "var/lib/zyrd/admin.token";
  TokenHandler first(path);
  ASSERT_TRUE(first.Enabled());
  std::string text = ReadFile(path);
  ASSERT_EQ(text.size(), 44u);  // 43 characters and a line feed
  EXPECT_EQ(
      text.find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_"),
      43u);
  EXPECT_EQ(Mode(path), 0600u);
  EXPECT_EQ(Mode(tmp / "var/lib/zyrd"), 0700u);

  TokenHandler second(path);
  EXPECT_EQ(ReadFile(path), text);
  std::string token = text.substr(0, 43);
  EXPECT_EQ(Outcome(second, token), "root @ORNA+KMS_ADMIN");
}

TEST(TokenHandlerTest, OnlyTheExactTokenIsAccepted) {
  ZyrdTest::TempDir tmp;
  std::string path = tmp / "admin.token";
  TokenHandler handler(path, [](uint8_t* out, size_t n) {
    for (size_t i = 0; i < n; ++i) out[i] = static_cast<uint8_t>(i);
    return true;
  });
  const std::string token = "AAECAwQFBgcICQoLDA0ODxAREhMUFRYXGBkaGxwdHh8";
  EXPECT_EQ(ReadFile(path), token + "\n");
  EXPECT_EQ(Outcome(handler, token), "root @ORNA+KMS_ADMIN");
  EXPECT_EQ(Outcome(handler, ""), "none");
  EXPECT_EQ(Outcome(handler, token + "A"), "none");
  EXPECT_EQ(Outcome(handler, token.substr(0, 42)), "none");
  std::string flipped = token;
  flipped[20] ^= 1;
  EXPECT_EQ(Outcome(handler, flipped), "none");
}

TEST(TokenHandlerTest, UnsafeOrUnwritableTokenDisablesAdminAuthentication) {
  ZyrdTest::LogCapture log;
  ZyrdTest::TempDir tmp;
  std::string shared = tmp / "shared.token";
  std::ofstream(shared) << "secret\n";
  chmod(shared.c_str(), 0644);
  TokenHandler readable(shared);
  EXPECT_FALSE(readable.Enabled());
  EXPECT_EQ(Outcome(readable, "secret"), "none");
  EXPECT_EQ(log.Count("must be a regular file of this user with mode 0600"), 1u);

  TokenHandler noRandom(tmp / "none.token", [](uint8_t*, size_t) { return false; });
  EXPECT_FALSE(noRandom.Enabled());
  EXPECT_FALSE(std::filesystem::exists(tmp / "none.token"));

  std::string empty = tmp / "empty.token";
  std::ofstream(empty) << "\n";
  chmod(empty.c_str(), 0600);
  EXPECT_FALSE(TokenHandler(empty).Enabled());
}

}  // namespace
