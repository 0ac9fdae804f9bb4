#include "platform/ssl/ssl_utils.h"

#include <gtest/gtest.h>

#include <cstdlib>

#include "tests/support/test_certs.h"

namespace {

using namespace Kestrel::Common::SslUtils;

const std::string kHead(kCertificateHeader);
const std::string kFoot(kCertificateFooter);

const ZyrdTest::TestCert& Cert() {
  static const ZyrdTest::TestCert cert = ZyrdTest::MakeSelfSignedCert("ssl-utils-test");
  return cert;
}

// The certificate's base64 on one line.
std::string Body() {
  std::string body;
  const std::string& pem = Cert().certificatePem;
  for (char c : pem.substr(kHead.size(), pem.find(kFoot) - kHead.size())) {
    if (c != '\n') body.push_back(c);
  }
  return body;
}

std::string Wrap(size_t width, const std::string& eol) {
  std::string out, body = Body();
  for (size_t i = 0; i < body.size(); i += width) out += body.substr(i, width) + eol;
  return out;
}

TEST(StandardizePemString, RewritesAnyLayoutIntoOpenSslsCanonicalForm) {
  for (const std::string& input :
       {Cert().certificatePem, kHead + "\n" + Wrap(76, "\n") + kFoot,
        "\r\n  " + kHead + "\r\n" + Wrap(64, "\r\n") + kFoot + "\r\n\r\n", kHead + Body() + kFoot,
        kHead + "\n" + Wrap(10, " \t\n") + kFoot}) {
    std::string pem = input;
    ASSERT_TRUE(StandardizePemString(kHead, kFoot + "\n", pem)) << input;
    EXPECT_EQ(pem, Cert().certificatePem) << input;
    ASSERT_TRUE(StandardizePemString(kHead, kFoot, pem));  // no line feed asked for
    EXPECT_EQ(pem + "\n", Cert().certificatePem);
  }
}

TEST(StandardizePemString, RefusesWhatIsNotOneBlockAndLeavesTheTextAlone) {
  const std::string& cert = Cert().certificatePem;
  for (const std::string& input :
       {std::string(), Body(), cert.substr(0, cert.find(kFoot)), cert.substr(kHead.size()),
        kFoot + "\n" + Body() + "\n" + kHead, cert + cert, "subject=CN=x\n" + cert,
        cert + "trailer\n", kHead + "\n\n" + kFoot, kHead + "\nQUJD!A==\n" + kFoot,
        kHead + "\nQUJ\n" + kFoot, Cert().privateKeyPem}) {
    std::string pem = input;
    EXPECT_FALSE(StandardizePemString(kHead, kFoot + "\n", pem)) << input;
    EXPECT_EQ(pem, input);
  }
}

TEST(ExtractKeyFromCert, GivesTheCertificatesPublicKey) {
  std::string publicKey = "untouched";
  EXPECT_FALSE(ExtractKeyFromCert("not a certificate", publicKey));
  EXPECT_FALSE(ExtractKeyFromCert(Cert().privateKeyPem, publicKey));
  EXPECT_EQ(publicKey, "untouched");
  ASSERT_TRUE(ExtractKeyFromCert(Cert().certificatePem, publicKey));
  EXPECT_EQ(publicKey, Cert().publicKeyPem);
}

}  // namespace
