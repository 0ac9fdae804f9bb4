#include "platform/token/token_handler.h"

#include <errno.h>
#include <fcntl.h>
#include <openssl/crypto.h>
#include <openssl/rand.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>

#include "platform/util/base64.h"
#include "platform/util/files.h"
#include "platform/util/log.h"

namespace Orna::Authn {
namespace {

constexpr size_t kMaxTokenFileSize = 1024;

bool DefaultRandom(uint8_t* out, size_t length) {
  return RAND_bytes(out, static_cast<int>(length)) == 1;
}

// Unpadded Base64url of `bytes`.
Groundwork::SecureString EncodeToken(const Groundwork::SecureBytes& bytes) {
  Groundwork::SecureString text = Groundwork::Base64EncodeSecret(bytes.data(), bytes.size());
  for (char& c : text.str()) {
    if (c == '+') c = '-';
    if (c == '/') c = '_';
  }
  while (!text.empty() && text.str().back() == '=') text.str().pop_back();
  return text;
}

}  // namespace

TokenHandler::TokenHandler(std::string tokenPath, RandomSource random)
    : path_(std::move(tokenPath)) {
  if (!LoadOrCreate(random ? random : RandomSource(DefaultRandom))) {
    token_.Wipe();
    Log_Level(2, "Admin token %s is unusable; admin token authentication is disabled\n",
              path_.c_str());
  }
}

bool TokenHandler::LoadOrCreate(const RandomSource& random) {
  int fd = ::open(path_.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC);
  if (fd < 0 && errno == ENOENT) {
    // First start: write a new token to a private temporary file and link it
    // into place, so the token file appears complete or not at all, and a
    // concurrent creator's token wins.
    std::string dir = path_.substr(0, path_.rfind('/'));
    Groundwork::MakeDirectories(dir, 0700);
    Groundwork::SecureBytes bytes(kTokenBytes);
    if (!random(bytes.data(), bytes.size())) {
      Log_Level(2, "Cannot generate an admin token\n");
      return false;
    }
    Groundwork::SecureString text = EncodeToken(bytes);
    text.str().push_back('\n');
    std::string tmp = path_ + ".tmp." + std::to_string(::getpid());
    int out = ::open(tmp.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOFOLLOW, 0600);
    bool written =
        out >= 0 && Groundwork::WriteAll(out, text.data(), text.size()) && ::fsync(out) == 0;
    if (out >= 0) ::close(out);
    if (!written || (::link(tmp.c_str(), path_.c_str()) != 0 && errno != EEXIST)) {
      Log_Level(2, "Cannot create admin token %s: %s\n", path_.c_str(), strerror(errno));
      ::unlink(tmp.c_str());
      return false;
    }
    ::unlink(tmp.c_str());
    int dirFd = ::open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dirFd >= 0) {
      ::fsync(dirFd);
      ::close(dirFd);
    }
    Log_Level(5, "Created admin token %s\n", path_.c_str());
    fd = ::open(path_.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC);
  }
  if (fd < 0) {
    Log_Level(2, "Cannot open admin token %s: %s\n", path_.c_str(), strerror(errno));
    return false;
  }
  struct stat st;
  if (::fstat(fd, &st) != 0 || !S_ISREG(st.st_mode) || (st.st_mode & 077) != 0 ||
      st.st_uid != ::geteuid()) {
    Log_Level(2, "Admin token %s must be a regular file of this user with mode 0600\n",
              path_.c_str());
    ::close(fd);
    return false;
  }
  token_.str().resize(kMaxTokenFileSize);
  ssize_t n = ::read(fd, token_.data(), kMaxTokenFileSize);
  ::close(fd);
  if (n <= 0) return false;
  token_.str().resize(static_cast<size_t>(n));
  while (!token_.empty() && isspace(static_cast<unsigned char>(token_.str().back()))) {
    token_.str().pop_back();
  }
  return !token_.empty();
}

void TokenHandler::Authenticate(const Lumo::Core::AsyncActivation& activation,
                                Lumo::Authn::AuthnCallback done) {
  Lumo::Core::OAuthSecurityContextReader reader(activation.securityContext);
  if (token_.empty() || !reader.IsValid()) {
    done({});
    return;
  }
  std::string_view presented = reader.accessToken();
  if (presented.size() != token_.size() ||
      CRYPTO_memcmp(presented.data(), token_.data(), token_.size()) != 0) {
    done({});
    return;
  }
  auto result = std::make_shared<Lumo::Authn::AuthenticationResult>();
  result->name = "PlatformAuthentication";
  result->accessToken.assign(presented);
  result->username = kAdminUser;
  result->entitlements = {kAdminEntitlement};
  done({std::move(result), nullptr});
}

}  // namespace Orna::Authn

namespace OrnaToken::Authz {

bool JwtEntitlementCheckerImpl::HasAnyEntitlement(const Lumo::Authn::AuthenticationResult& caller,
                                                  const std::vector<std::string>& required) const {
  for (const auto& held : caller.entitlements) {
    if (std::find(required.begin(), required.end(), held) != required.end()) return true;
  }
  return false;
}

}  // namespace OrnaToken::Authz
