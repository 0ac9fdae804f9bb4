#include "platform/ssl/ssl_utils.h"

#include <openssl/pem.h>

#include <algorithm>
#include <cstdint>
#include <vector>

#include "platform/ssl/openssl_ptr.h"
#include "platform/util/base64.h"
#include "platform/util/hex.h"

namespace Kestrel::Common::SslUtils {
namespace {

using Ssl::BioPtr;

constexpr size_t kPemLineLength = 64;

bool IsSpace(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

std::string_view TrimRight(std::string_view s) {
  while (!s.empty() && IsSpace(s.back())) s.remove_suffix(1);
  return s;
}

bool OnlySpace(std::string_view s) {
  for (char c : s) {
    if (!IsSpace(c)) return false;
  }
  return true;
}

}  // namespace

bool StandardizePemString(std::string_view header, std::string_view footer, std::string& pem) {
  std::string_view headerMarker = TrimRight(header);
  std::string_view footerMarker = TrimRight(footer);
  if (headerMarker.empty() || footerMarker.empty()) return false;

  std::string_view text = pem;
  size_t begin = text.find(headerMarker);
  if (begin == std::string_view::npos) return false;
  size_t payloadStart = begin + headerMarker.size();
  size_t end = text.find(footerMarker, payloadStart);
  if (end == std::string_view::npos) return false;
  if (!OnlySpace(text.substr(0, begin)) || !OnlySpace(text.substr(end + footerMarker.size()))) {
    return false;
  }

  std::string compact;
  for (char c : text.substr(payloadStart, end - payloadStart)) {
    if (!IsSpace(c)) compact.push_back(c);
  }
  std::vector<uint8_t> der;
  if (compact.empty() || !Base64_Decode(compact, &der) || der.empty()) return false;

  std::vector<char> encoded(Base64_EncodedLength(der.data(), der.size()));
  size_t encodedLength = 0;
  if (!Base64_Encode(der.data(), der.size(), encoded.data(), encoded.size(), &encodedLength)) {
    return false;
  }

  std::string out;
  out.reserve(headerMarker.size() + footerMarker.size() + encodedLength * 65 / 64 + 4);
  out.append(headerMarker).push_back('\n');
  for (size_t i = 0; i < encodedLength; i += kPemLineLength) {
    out.append(encoded.data() + i, std::min(kPemLineLength, encodedLength - i)).push_back('\n');
  }
  out.append(footerMarker);
  if (!footer.empty() && footer.back() == '\n') out.push_back('\n');
  pem = std::move(out);
  return true;
}

bool StandardizePemCert(std::string& pem) {
  static const std::string kFooterLine = std::string(kCertificateFooter) + "\n";
  return StandardizePemString(kCertificateHeader, kFooterLine, pem);
}

bool ExtractKeyFromCert(const std::string& certPem, std::string& keyPem) {
  BioPtr in = Ssl::ReadOnlyBio(certPem);
  if (!in) return false;
  Ssl::X509Ptr cert(PEM_read_bio_X509(in.get(), nullptr, nullptr, nullptr));
  EVP_PKEY* key = cert ? X509_get0_pubkey(cert.get()) : nullptr;
  BioPtr out(BIO_new(BIO_s_mem()));
  if (key == nullptr || !out || PEM_write_bio_PUBKEY(out.get(), key) != 1) {
    ERR_clear_error();
    return false;
  }
  keyPem = Ssl::BioText(out.get());
  return true;
}

bool ComputeHashHex(std::string_view data, std::string& hex, const char* algorithm) {
  Ssl::EvpMdPtr md(EVP_MD_fetch(nullptr, algorithm, nullptr));
  Ssl::EvpMdCtxPtr ctx(EVP_MD_CTX_new());
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int length = 0;
  if (!md || !ctx || EVP_DigestInit_ex2(ctx.get(), md.get(), nullptr) != 1 ||
      EVP_DigestUpdate(ctx.get(), data.data(), data.size()) != 1 ||
      EVP_DigestFinal_ex(ctx.get(), digest, &length) != 1) {
    ERR_clear_error();
    return false;
  }
  hex = Groundwork::HexEncode({reinterpret_cast<const char*>(digest), length});
  return true;
}

}  // namespace Kestrel::Common::SslUtils
