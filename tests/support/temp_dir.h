// A scratch directory under $TMPDIR (or /tmp), removed with everything in it
// when the object goes away.
#pragma once

#include <cstdlib>
#include <filesystem>
#include <string>

namespace ZyrdTest {

class TempDir {
 public:
  TempDir() {
    std::string pattern = (std::filesystem::temp_directory_path() / "zyrd-test-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) std::abort();
    text_ = pattern;
    path_ = pattern;
  }
  ~TempDir() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  const std::string& Path() const { return text_; }
  const std::filesystem::path& path() const { return path_; }
  // A path inside the directory.
  std::string File(const std::string& relative) const { return text_ + "/" + relative; }
  std::string operator/(const std::string& relative) const { return File(relative); }

 private:
  std::string text_;
  std::filesystem::path path_;
};

}  // namespace ZyrdTest
