#include "api/kms_auth_token_handler.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>

#include "errors/error_builders.h"
#include "tests/api/token_signer.h"
#include "tests/support/fakes.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace {

using Zyrd::Authn::KmsAuthTokenHandler;
using ZyrdTest::TokenBuilder;

constexpr long kNow = 1'700'000'000;

class KmsAuthTokenHandlerTest : public ::testing::Test {
 protected:
  void SetUp() override { clock_.SetRealtimeUs(kNow * 1'000'000 + 999'999); }

  // "accepted", "none", or the error's name and message id.
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
        out = o.error->Name() + " " + o.error->Messages().at(0).id + " " +
              o.error->Messages().at(0).defaultMessage;
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

  static constexpr const char* kRefused =
      "com.tarsel.lumo.std.errors.unauthenticated com.tarsel.orna.kms.authentication.invalid_token "
      "Invalid Token.";

  ZyrdTest::LogCapture log_;
  ZyrdTest::FakeClock clock_;
  int keyReads_ = 0;
  bool keyAvailable_ = true;
  std::shared_ptr<const Lumo::L10n::Localizer> localizer_ =
      std::shared_ptr<const Lumo::L10n::Localizer>(&Zyrd::ZyrApi::CatalogueLocalizer(),
                                                   [](auto*) {});
  KmsAuthTokenHandler handler_{[this](std::string& key) {
                                 ++keyReads_;
                                 if (keyAvailable_) key = ZyrdTest::VouchdKey().publicPem;
                                 return keyAvailable_;
                               },
                               clock_};
};

TEST_F(KmsAuthTokenHandlerTest, ValidTokenIsAcceptedAndTheKeyIsReadOnce) {
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Sign()), "accepted");
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Sign()), "accepted");
  EXPECT_EQ(keyReads_, 1);
  EXPECT_EQ(log_.Count("Successfully cached vouchd public key"), 1u);
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

TEST_F(KmsAuthTokenHandlerTest, TokensThisHandlerCannotVerifyPassOn) {
  EXPECT_EQ(Check(""), "none");
  EXPECT_TRUE(log_.Has(6, "OAuth security context is invalid\n"));
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Sign(ZyrdTest::OtherKey())), "none");
  EXPECT_EQ(Check("not.a.token"), "none");
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Encode(JWT_ALG_HS256, "some other secret")), "none");
  EXPECT_EQ(log_.Count("Not an attestation token"), 3u);
  EXPECT_EQ(log_.Count("Attestation token validation failed"), 0u);
}

TEST_F(KmsAuthTokenHandlerTest, ExpiryIsComparedInWholeSeconds) {
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Exp(kNow).Sign()), "accepted");
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Exp(kNow - 1).Sign()), kRefused);
  EXPECT_TRUE(log_.Has(2, "Token is expired\n"));
  EXPECT_TRUE(log_.Has(2, "Attestation token validation failed\n"));
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Remove("exp").Sign()), kRefused);
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Exp(-5).Sign()), kRefused);
  EXPECT_EQ(log_.Count("Token is expired"), 3u);
}

TEST_F(KmsAuthTokenHandlerTest, AnAcceptedTokenStillExpires) {
  std::string token = TokenBuilder::Valid(kNow).Exp(kNow + 10).Sign();
  EXPECT_EQ(Check(token), "accepted");
  clock_.SetRealtimeUs((kNow + 10) * 1'000'000 + 999'999);
  EXPECT_EQ(Check(token), "accepted");
  clock_.SetRealtimeUs((kNow + 11) * 1'000'000);
  EXPECT_EQ(Check(token), kRefused);
  EXPECT_TRUE(log_.Has(2, "Token is expired\n"));
}

TEST_F(KmsAuthTokenHandlerTest, IssuerMustContainAttestationAnywhere) {
  for (const char* iss : {"/attestation", "https://h/attestation/v1", "x/attestation"}) {
    EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Remove("iss").Claim("iss", iss).Sign()), "accepted")
        << iss;
  }
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Remove("iss").Claim("iss", "https://h/attest").Sign()),
            kRefused);
  EXPECT_TRUE(log_.Has(2, "Jwt issuer grant is invalid: https://h/attest\n"));
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Remove("iss").Sign()), kRefused);
  EXPECT_TRUE(log_.Has(2, "Jwt issuer grant is invalid: \n"));
}

TEST_F(KmsAuthTokenHandlerTest, AudienceMustBeAStringStartingWithZyrd) {
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Remove("aud").Claim("aud", "zyrd-host-7").Sign()),
            "accepted");
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Remove("aud").Claim("aud", "zyr").Sign()), kRefused);
  EXPECT_TRUE(log_.Has(2, "Jwt aud grant is invalid: zyr\n"));
  EXPECT_EQ(Check(TokenBuilder::Valid(kNow).Remove("aud").Json(R"({"aud":["zyrd"]})").Sign()),
            kRefused);
  EXPECT_TRUE(log_.Has(2, "Jwt aud grant is invalid: \n"));
}

TEST_F(KmsAuthTokenHandlerTest, Hs256IsRefusedEvenWhenItsSignatureChecks) {
  // An HMAC over vouchd's public key verifies with that key as the secret.
  std::string token =
      TokenBuilder::Valid(kNow).Encode(JWT_ALG_HS256, ZyrdTest::VouchdKey().publicPem);
  EXPECT_EQ(Check(token), kRefused);
  EXPECT_TRUE(log_.Has(2, "Token algorithm is invalid: 1\n"));
}

}  // namespace

namespace {

std::string RunTool(const std::string& command) {
  std::string out;
  FILE* pipe = popen(command.c_str(), "r");
  if (pipe == nullptr) return out;
  char buffer[4096];
  size_t n;
  while ((n = fread(buffer, 1, sizeof(buffer), pipe)) > 0) out.append(buffer, n);
  pclose(pipe);
  while (!out.empty() && out.back() == '\n') out.pop_back();
  return out;
}

// The developer tools make keys and tokens this handler accepts.
TEST(AttestationToolsTest, MintedTokenIsAcceptedWithTheMadeKey) {
  ZyrdTest::TempDir dir;
  const std::string tools = std::string(ZYRD_SOURCE_DIR) + "/tools/";
  RunTool(tools + "make-attestation-key " + dir.Path());
  std::ifstream in(dir / "attestation-pubkey.pem");
  std::string publicKey((std::istreambuf_iterator<char>(in)), {});
  ASSERT_NE(publicKey.find("BEGIN PUBLIC KEY"), std::string::npos);

  Zyrd::Authn::KmsAuthTokenHandler handler(
      [&](std::string& key) {
        key = publicKey;
        return true;
      },
      Groundwork::SystemClock());
  auto check = [&](const std::string& args) {
    Lumo::Core::AsyncActivation activation;
    activation.securityContext.scheme = Lumo::Core::SecurityContext::kOAuthScheme;
    activation.securityContext.accessToken.assign(
        RunTool(tools + "mint-attestation-token --key " + (dir / "attestation-key.pem") + args));
    std::string out;
    handler.Authenticate(activation, [&](Lumo::Authn::AuthnOutcome o) {
      out = o.result ? "accepted" : o.error ? "refused" : "none";
    });
    return out;
  };
  EXPECT_EQ(check(""), "accepted");
  EXPECT_EQ(check(" --ttl -10"), "refused");
  EXPECT_EQ(check(" --aud other"), "refused");
}

}  // namespace
