#include "api/kms_auth_token_handler.h"

#include <gtest/gtest.h>

#include "errors/error_builders.h"
#include "tests/api/token_signer.h"
#include "tests/support/fakes.h"
#include "tests/support/log_capture.h"

namespace {

using ZyrdTest::TokenBuilder;

constexpr long kNow = 1'700'000'000;
constexpr const char* kRefused =
    "com.tarsel.lumo.std.errors.unauthenticated com.tarsel.orna.kms.authentication.invalid_token "
    "Invalid Token.";

class KmsAuthTokenHandlerTest : public ::testing::Test {
 protected:
  void SetUp() override { clock_.SetRealtimeUs(kNow * 1'000'000 + 999'999); }

  // "accepted", "none" (passed on), or the error's name, message id and text.
  std::string Check(const std::string& token) {
    Lumo::Core::AsyncActivation activation;
    activation.requestLocalizer = localizer_;
    if (!token.empty()) {
      activation.securityContext.scheme = Lumo::Core::SecurityContext::kOAuthScheme;
      activation.securityContext.accessToken.assign(token);
    }
    std::string out = "(not completed)";
    handler_.Authenticate(activation, [&](Lumo::Authn::AuthnOutcome o) {
      if (o.error != nullptr) {
        const auto& m = o.error->Messages().at(0);
        out = o.error->Name() + " " + m.id + " " + m.defaultMessage;
      } else if (o.result == nullptr) {
        out = "none";
      } else {
        EXPECT_EQ(o.result->name, "KmsAuthentication");
        EXPECT_EQ(o.result->username, "<ATTEST>");
        EXPECT_EQ(o.result->entitlements, std::vector<std::string>{"@ATTEST+KEY_OPERATIONS"});
        EXPECT_EQ(o.result->accessToken.view(), token);
        out = "accepted";
      }
    });
    return out;
  }

  ZyrdTest::LogCapture log_;
  ZyrdTest::FakeClock clock_;
  int keyReads_ = 0;
  bool keyAvailable_ = true;
  std::shared_ptr<const Lumo::L10n::Localizer> localizer_{&Zyrd::ZyrApi::CatalogueLocalizer(),
                                                          [](auto*) {}};
  Zyrd::Authn::KmsAuthTokenHandler handler_{[this](std::string& key) {
                                              ++keyReads_;
                                              if (keyAvailable_) {
                                                key = ZyrdTest::VouchdKey().publicPem;
                                              }
                                              return keyAvailable_;
                                            },
                                            clock_};
};

TEST_F(KmsAuthTokenHandlerTest, EveryCheckInOrderWithItsLogLine) {
  auto valid = [] { return TokenBuilder::Valid(kNow); };
  const struct {
    std::string token;
    const char* outcome;
    const char* logged;
  } cases[] = {
      {valid().Sign(), "accepted", "Successfully cached vouchd public key"},
      // Tokens this handler cannot verify are passed on to the next one.
      {"", "none", "OAuth security context is invalid"},
      {valid().Sign(ZyrdTest::OtherKey()), "none", "Not an attestation token"},
      {"not.a.token", "none", "Not an attestation token"},
      {valid().Encode(JWT_ALG_HS256, "some other secret"), "none", "Not an attestation token"},
      // An HMAC over vouchd's public key verifies with that key as the secret.
      {valid().Encode(JWT_ALG_HS256, ZyrdTest::VouchdKey().publicPem), kRefused,
       "Token algorithm is invalid: 1\n"},
      // Expiry is compared in whole seconds.
      {valid().Exp(kNow).Sign(), "accepted", ""},
      {valid().Exp(kNow - 1).Sign(), kRefused, "Token is expired\n"},
      {valid().Exp(-5).Sign(), kRefused, "Token is expired\n"},
      {valid().Claim("exp", "").Sign(), kRefused, "Token is expired\n"},
      // The issuer contains "/attestation" anywhere.
      {valid().Claim("iss", "/attestation").Sign(), "accepted", ""},
      {valid().Claim("iss", "https://h/attestation/v1").Sign(), "accepted", ""},
      {valid().Claim("iss", "https://h/attest").Sign(), kRefused,
       "Jwt issuer grant is invalid: https://h/attest\n"},
      {valid().Claim("iss", "").Sign(), kRefused, "Jwt issuer grant is invalid: \n"},
      // The audience is a string that starts with "zyrd".
      {valid().Claim("aud", "zyrd-host-7").Sign(), "accepted", ""},
      {valid().Claim("aud", "zyr").Sign(), kRefused, "Jwt aud grant is invalid: zyr\n"},
      {valid().Claim("aud", "").Json(R"({"aud":["zyrd"]})").Sign(), kRefused,
       "Jwt aud grant is invalid: \n"},
  };
  for (const auto& c : cases) {
    log_.Clear();
    EXPECT_EQ(Check(c.token), c.outcome) << c.token;
    EXPECT_EQ(*c.logged ? log_.Count(c.logged) : 1u, 1u) << c.token << ": " << c.logged;
    EXPECT_EQ(log_.Has(2, "Attestation token validation failed\n"),
              c.outcome == std::string(kRefused));
  }
  EXPECT_EQ(keyReads_, 1);  // the key is read once and cached
}

TEST_F(KmsAuthTokenHandlerTest, WithoutAKeyCallsPassOnAndEveryCallRetries) {
  keyAvailable_ = false;
  std::string token = TokenBuilder::Valid(kNow).Sign();
  EXPECT_EQ(Check(token), "none");
  EXPECT_EQ(Check(token), "none");
  EXPECT_TRUE(log_.Has(2, "Error retrieving vouchd pubkey\n"));
  keyAvailable_ = true;
  EXPECT_EQ(Check(token), "accepted");
  EXPECT_EQ(keyReads_, 3);
}

TEST_F(KmsAuthTokenHandlerTest, AnAcceptedTokenStillExpires) {
  std::string token = TokenBuilder::Valid(kNow).Exp(kNow + 10).Sign();
  EXPECT_EQ(Check(token), "accepted");
  clock_.SetRealtimeUs((kNow + 10) * 1'000'000 + 999'999);
  EXPECT_EQ(Check(token), "accepted");
  clock_.SetRealtimeUs((kNow + 11) * 1'000'000);
  EXPECT_EQ(Check(token), kRefused);
}

}  // namespace
