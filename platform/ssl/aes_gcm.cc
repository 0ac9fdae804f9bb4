#include "platform/ssl/aes_gcm.h"

#include <openssl/evp.h>
#include <openssl/rand.h>

#include <climits>
#include <memory>

#include "platform/ssl/openssl_ptr.h"

namespace Kestrel::Common::SslUtils {
namespace {

using CipherCtx = Ssl::EvpCipherCtxPtr;

const EVP_CIPHER* CipherFor(size_t keyLength) {
  switch (keyLength) {
    case 16: return EVP_aes_128_gcm();
    case 32: return EVP_aes_256_gcm();
    default: return nullptr;
  }
}

bool FitsInt(size_t n) { return n <= static_cast<size_t>(INT_MAX); }

}  // namespace

bool AesGcmEncrypt(std::span<const uint8_t> plaintext, std::span<const uint8_t> key,
                   std::span<const uint8_t> aad, std::vector<uint8_t>& iv,
                   std::vector<uint8_t>& ciphertext, std::vector<uint8_t>& tag) {
  iv.clear();
  ciphertext.clear();
  tag.clear();
  const EVP_CIPHER* cipher = CipherFor(key.size());
  if (cipher == nullptr || !FitsInt(plaintext.size()) || !FitsInt(aad.size())) return false;

  std::vector<uint8_t> freshIv(kAesGcmIvLength);
  if (RAND_bytes(freshIv.data(), static_cast<int>(freshIv.size())) != 1) return false;

  CipherCtx ctx(EVP_CIPHER_CTX_new());
  if (!ctx) return false;
  int len = 0;
  std::vector<uint8_t> out(plaintext.size());
  std::vector<uint8_t> outTag(kAesGcmTagLength);
  bool ok =
      EVP_EncryptInit_ex(ctx.get(), cipher, nullptr, nullptr, nullptr) == 1 &&
      EVP_CIPHER_CTX_ctrl(ctx.get(), EVP_CTRL_GCM_SET_IVLEN, static_cast<int>(freshIv.size()),
                          nullptr) == 1 &&
      EVP_EncryptInit_ex(ctx.get(), nullptr, nullptr, key.data(), freshIv.data()) == 1 &&
      (aad.empty() ||
       EVP_EncryptUpdate(ctx.get(), nullptr, &len, aad.data(), static_cast<int>(aad.size())) ==
           1) &&
      EVP_EncryptUpdate(ctx.get(), out.data(), &len, plaintext.data(),
                        static_cast<int>(plaintext.size())) == 1 &&
      EVP_EncryptFinal_ex(ctx.get(), out.data() + len, &len) == 1 &&
      EVP_CIPHER_CTX_ctrl(ctx.get(), EVP_CTRL_GCM_GET_TAG, static_cast<int>(outTag.size()),
                          outTag.data()) == 1;
  if (!ok) return false;
  iv = std::move(freshIv);
  ciphertext = std::move(out);
  tag = std::move(outTag);
  return true;
}

bool AesGcmDecrypt(std::span<const uint8_t> ciphertext, std::span<const uint8_t> key,
                   std::span<const uint8_t> iv, std::span<const uint8_t> aad,
                   std::span<const uint8_t> tag, Groundwork::SecureBytes& plaintext) {
  plaintext.clear();
  const EVP_CIPHER* cipher = CipherFor(key.size());
  // Only the IV and tag lengths that encryption produces are accepted: a
  // truncated tag would make forgeries cheaper.
  if (cipher == nullptr || iv.size() != kAesGcmIvLength || tag.size() != kAesGcmTagLength ||
      !FitsInt(ciphertext.size()) || !FitsInt(aad.size())) {
    return false;
  }
  CipherCtx ctx(EVP_CIPHER_CTX_new());
  if (!ctx) return false;
  Groundwork::SecureBytes out(ciphertext.size());
  int len = 0;
  // The tag is passed through a copy: the control call takes a non-const
  // pointer.
  std::vector<uint8_t> expectedTag(tag.begin(), tag.end());
  bool ok =
      EVP_DecryptInit_ex(ctx.get(), cipher, nullptr, nullptr, nullptr) == 1 &&
      EVP_DecryptInit_ex(ctx.get(), nullptr, nullptr, key.data(), iv.data()) == 1 &&
      (aad.empty() ||
       EVP_DecryptUpdate(ctx.get(), nullptr, &len, aad.data(), static_cast<int>(aad.size())) ==
           1) &&
      EVP_DecryptUpdate(ctx.get(), out.data(), &len, ciphertext.data(),
                        static_cast<int>(ciphertext.size())) == 1 &&
      EVP_CIPHER_CTX_ctrl(ctx.get(), EVP_CTRL_GCM_SET_TAG, static_cast<int>(expectedTag.size()),
                          expectedTag.data()) == 1 &&
      EVP_DecryptFinal_ex(ctx.get(), out.data() + len, &len) == 1;
  if (!ok) return false;  // `out` wipes itself
  plaintext = std::move(out);
  return true;
}

}  // namespace Kestrel::Common::SslUtils
