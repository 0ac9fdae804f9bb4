#include "platform/util/files.h"

#include <errno.h>
#include <fcntl.h>
#include <openssl/crypto.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

namespace Groundwork {

bool MakeDirectories(const std::string& dir, mode_t mode) {
  for (size_t pos = 1; pos != std::string::npos;) {
    pos = dir.find('/', pos + 1);
    ::mkdir(dir.substr(0, pos).c_str(), mode);
  }
  struct stat st;
  return ::stat(dir.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

bool WriteAll(int fd, const char* data, size_t size) {
  while (size > 0) {
    ssize_t n = ::write(fd, data, size);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    data += n;
    size -= static_cast<size_t>(n);
  }
  return true;
}

bool ReadAll(int fd, SecureString* out) {
  out->clear();
  char chunk[4096];
  ssize_t n;
  while ((n = ::read(fd, chunk, sizeof chunk)) != 0) {
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) break;
    out->str().append(chunk, static_cast<size_t>(n));
  }
  OPENSSL_cleanse(chunk, sizeof chunk);
  if (n < 0) out->clear();
  return n == 0;
}

bool ReadSecretFile(const std::string& path, SecureString* out) {
  if (path == "-") return ReadAll(STDIN_FILENO, out);
  int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return false;
  bool ok = ReadAll(fd, out);
  int saved = errno;
  ::close(fd);
  errno = saved;
  return ok;
}

bool ReplaceFile(const std::string& path, std::string_view content, mode_t mode,
                 std::string* error) {
  const size_t slash = path.rfind('/');
  const std::string dir = slash == std::string::npos ? "." : path.substr(0, slash + 1);
  std::string tmp = path + ".XXXXXX";
  auto fail = [&](const char* what, const std::string& name) {
    if (error != nullptr) *error = std::string(what) + " " + name + ": " + strerror(errno);
    return false;
  };

  int fd = ::mkostemp(tmp.data(), O_CLOEXEC);
  if (fd < 0) return fail("cannot create", tmp);
  bool written =
      ::fchmod(fd, mode) == 0 && WriteAll(fd, content.data(), content.size()) && ::fsync(fd) == 0;
  int saved = errno;
  if (::close(fd) != 0 && written) {
    written = false;
    saved = errno;
  }
  if (!written || ::rename(tmp.c_str(), path.c_str()) != 0) {
    if (written) saved = errno;
    ::unlink(tmp.c_str());
    errno = saved;
    return fail(written ? "cannot rename over" : "cannot write", written ? path : tmp);
  }
  // The new file is in place. Flushing the directory makes the rename
  // survive a crash; should that fail, the change has still been made.
  int dirFd = ::open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (dirFd >= 0) {
    ::fsync(dirFd);
    ::close(dirFd);
  }
  return true;
}

}  // namespace Groundwork
