// Certificate and digest utilities on OpenSSL 3.
//
// All functions are thread-safe and report success with true; on failure
// their outputs are left as they were. None of them logs.
#pragma once

#include <string>
#include <string_view>

namespace Kestrel::Common::SslUtils {

inline constexpr std::string_view kCertificateHeader = "-----BEGIN CERTIFICATE-----";
inline constexpr std::string_view kCertificateFooter = "-----END CERTIFICATE-----";

// Rewrites the one PEM block in `pem` into its standardised form, in place:
//
//   <header>\n
//   <base64 of the payload in lines of exactly 64 characters, the last line
//    possibly shorter, each ending in \n>
//   <footer>[\n]
//
// `header` and `footer` are the marker lines (e.g. kCertificateHeader and
// kCertificateFooter); trailing white space on them is not part of the
// marker. The result ends in a line feed exactly when `footer` does, so
// callers ask for one by passing the footer with "\n".
//
// The input may wrap its base64 at any width, use CR LF line ends, carry
// blanks inside the payload and white space before the header or after the
// footer. The payload is decoded and re-encoded, so padding and unused bits
// come out canonical. It fails when a marker is missing, the footer comes
// before the header, anything but white space lies outside the block (a
// second block, explanatory text), or the payload is empty or not base64.
// Only the text is checked: whether the bytes are a valid certificate is
// not.
bool StandardizePemString(std::string_view header, std::string_view footer, std::string& pem);

// The public key of the PEM certificate `certPem` as a PEM "PUBLIC KEY"
// block (SubjectPublicKeyInfo), the form JWT libraries take to verify
// RS256 (and ES256) signatures. Fails when `certPem` holds no certificate.
bool ExtractKeyFromCert(const std::string& certPem, std::string& keyPem);

// The digest of `data` as lower-case hexadecimal text. `algorithm` is an
// OpenSSL digest name ("SHA256", "SHA384", ...); an unknown name fails.
bool ComputeHashHex(std::string_view data, std::string& hex, const char* algorithm = "SHA256");

}  // namespace Kestrel::Common::SslUtils
