#include "platform/ssl/ssl_utils.h"

#include <gtest/gtest.h>
#include <jwt.h>

#include <cstdlib>

#include "tests/support/test_certs.h"

namespace {

using namespace Kestrel::Common::SslUtils;

const std::string kFooterLine = std::string(kCertificateFooter) + "\n";

const ZyrdTest::TestCert& Cert() {
  static const ZyrdTest::TestCert cert = ZyrdTest::MakeSelfSignedCert("ssl-utils-test");
  return cert;
}

// The base64 body of the test certificate on one line.
std::string Body() {
  std::string body;
  const std::string& pem = Cert().certificatePem;
  size_t start = pem.find('\n') + 1;
  size_t end = pem.find(kCertificateFooter);
  for (char c : pem.substr(start, end - start)) {
    if (c != '\n') body.push_back(c);
  }
  return body;
}

std::string Wrap(const std::string& body, size_t width, const std::string& eol) {
  std::string out;
  for (size_t i = 0; i < body.size(); i += width) out += body.substr(i, width) + eol;
  return out;
}

TEST(StandardizePemString, RewritesAnyLayoutIntoOpenSslsCanonicalForm) {
  const std::string head(kCertificateHeader);
  const std::string foot(kCertificateFooter);
  const std::string layouts[] = {
      Cert().certificatePem,
      head + "\n" + Wrap(Body(), 76, "\n") + foot + "\n",
      "\r\n  " + head + "\r\n" + Wrap(Body(), 64, "\r\n") + foot + "\r\n\r\n",
      head + Body() + foot,
      head + "\n" + Wrap(Body(), 10, " \t\n") + foot,
  };
  for (const auto& input : layouts) {
    std::string pem = input;
    ASSERT_TRUE(StandardizePemString(kCertificateHeader, kFooterLine, pem)) << input;
    EXPECT_EQ(pem, Cert().certificatePem) << input;
  }
}

TEST(StandardizePemString, EndsInALineFeedOnlyWhenTheFooterDoes) {
  std::string pem = Cert().certificatePem;
  ASSERT_TRUE(StandardizePemString(kCertificateHeader, kCertificateFooter, pem));
  EXPECT_EQ(pem + "\n", Cert().certificatePem);
  ASSERT_TRUE(StandardizePemString(kCertificateHeader, kCertificateFooter, pem));
  EXPECT_EQ(pem + "\n", Cert().certificatePem);
}

TEST(StandardizePemString, ShortPayloadsAndCanonicalPadding) {
  std::string pem = "-----BEGIN X-----\nQUJD\nRA==\n-----END X-----";
  ASSERT_TRUE(StandardizePemString("-----BEGIN X-----", "-----END X-----\n", pem));
  EXPECT_EQ(pem, "-----BEGIN X-----\nQUJDRA==\n-----END X-----\n");
}

TEST(StandardizePemString, RefusesWhatIsNotOneBlockAndLeavesTheTextAlone) {
  const std::string cert = Cert().certificatePem;
  const std::string bad[] = {
      "",
      Body(),
      cert.substr(0, cert.find(kCertificateFooter)),  // no footer
      cert.substr(cert.find('\n') + 1),               // no header
      std::string(kCertificateFooter) + "\n" + Body() + "\n" + std::string(kCertificateHeader),
      cert + cert,                                                                 // two blocks
      "subject=CN=x\n" + cert,                                                     // text before
      cert + "trailer\n",                                                          // text after
      std::string(kCertificateHeader) + "\n\n" + std::string(kCertificateFooter),  // empty
      std::string(kCertificateHeader) + "\nQUJD!A==\n" + std::string(kCertificateFooter),
      std::string(kCertificateHeader) + "\nQUJ\n" + std::string(kCertificateFooter),
      std::string(kCertificateHeader) + "\n=QUJD\n" + std::string(kCertificateFooter),
      Cert().privateKeyPem,  // other markers
  };
  for (const auto& input : bad) {
    std::string pem = input;
    EXPECT_FALSE(StandardizePemString(kCertificateHeader, kFooterLine, pem)) << input;
    EXPECT_EQ(pem, input);
  }
}

TEST(ExtractKeyFromCert, GivesTheSubjectPublicKey) {
  std::string key;
  ASSERT_TRUE(ExtractKeyFromCert(Cert().certificatePem, key));
  EXPECT_EQ(key, Cert().publicKeyPem);

  std::string untouched = "before";
  EXPECT_FALSE(ExtractKeyFromCert("not a certificate", untouched));
  EXPECT_FALSE(ExtractKeyFromCert(Cert().privateKeyPem, untouched));
  EXPECT_EQ(untouched, "before");
}

TEST(ExtractKeyFromCert, KeyVerifiesRs256TokensSignedByTheCertificatesKey) {
  std::string publicKey;
  ASSERT_TRUE(ExtractKeyFromCert(Cert().certificatePem, publicKey));

  auto sign = [](const std::string& privateKey) {
    jwt_t* jwt = nullptr;
    EXPECT_EQ(jwt_new(&jwt), 0);
    jwt_add_grant(jwt, "iss", "vouchd");
    jwt_set_alg(jwt, JWT_ALG_RS256, reinterpret_cast<const unsigned char*>(privateKey.data()),
                static_cast<int>(privateKey.size()));
    char* encoded = jwt_encode_str(jwt);
    std::string token = encoded ? encoded : "";
    free(encoded);
    jwt_free(jwt);
    return token;
  };
  auto verifies = [&](const std::string& token) {
    jwt_t* jwt = nullptr;
    int rc =
        jwt_decode(&jwt, token.c_str(), reinterpret_cast<const unsigned char*>(publicKey.data()),
                   static_cast<int>(publicKey.size()));
    bool ok = rc == 0 && jwt_get_alg(jwt) == JWT_ALG_RS256;
    jwt_free(jwt);
    return ok;
  };

  EXPECT_TRUE(verifies(sign(Cert().privateKeyPem)));
  EXPECT_FALSE(verifies(sign(ZyrdTest::MakeSelfSignedCert("other").privateKeyPem)));
}

TEST(ComputeHashHex, LowerCaseHexOfKnownDigests) {
  std::string hex;
  ASSERT_TRUE(ComputeHashHex("abc", hex));
  EXPECT_EQ(hex, "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
  ASSERT_TRUE(ComputeHashHex("", hex));
  EXPECT_EQ(hex, "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855");
  ASSERT_TRUE(ComputeHashHex("abc", hex, "SHA1"));
  EXPECT_EQ(hex, "a9993e364706816aba3e25717850c26c9cd0d89d");
}

TEST(ComputeHashHex, UnknownAlgorithmFailsAndLeavesTheOutput) {
  std::string hex = "unchanged";
  EXPECT_FALSE(ComputeHashHex("abc", hex, "NO-SUCH-DIGEST"));
  EXPECT_EQ(hex, "unchanged");
}

}  // namespace
