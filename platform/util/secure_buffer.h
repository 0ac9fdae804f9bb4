// Containers for secrets (key material, plaintext, their Base64 text) that
// overwrite their memory before it is released, on every path, so that no
// copy of a secret outlives its use in freed heap or in a dead object.
//
// SecureBytes wipes every buffer it gives back to the allocator (growth and
// destruction). SecureString additionally wipes its own small-string buffer,
// which never reaches the allocator.
#pragma once

#include <openssl/crypto.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace Groundwork {

template <typename T>
struct ZeroingAllocator {
  using value_type = T;

  ZeroingAllocator() noexcept = default;
  template <typename U>
  ZeroingAllocator(const ZeroingAllocator<U>&) noexcept {}

  T* allocate(size_t n) { return std::allocator<T>().allocate(n); }
  void deallocate(T* p, size_t n) noexcept {
    OPENSSL_cleanse(p, n * sizeof(T));
    std::allocator<T>().deallocate(p, n);
  }

  template <typename U>
  bool operator==(const ZeroingAllocator<U>&) const noexcept {
    return true;
  }
};

using SecureBytes = std::vector<uint8_t, ZeroingAllocator<uint8_t>>;

// Overwrites the bytes now (not only when the buffer is released) and empties it.
inline void Wipe(SecureBytes& bytes) {
  OPENSSL_cleanse(bytes.data(), bytes.size());
  bytes.clear();
}

class SecureString {
 public:
  using Base = std::basic_string<char, std::char_traits<char>, ZeroingAllocator<char>>;

  SecureString() = default;
  explicit SecureString(std::string_view text) : s_(text.data(), text.size()) {}
  SecureString(const SecureString&) = default;
  SecureString(SecureString&& other) noexcept : s_(std::move(other.s_)) { other.Wipe(); }
  SecureString& operator=(const SecureString& other) {
    if (this != &other) {
      Wipe();
      s_ = other.s_;
    }
    return *this;
  }
  SecureString& operator=(SecureString&& other) noexcept {
    if (this != &other) {
      Wipe();
      s_ = std::move(other.s_);
      other.Wipe();
    }
    return *this;
  }
  ~SecureString() { Wipe(); }

  void assign(std::string_view text) {
    Wipe();
    s_.assign(text.data(), text.size());
  }
  void clear() { Wipe(); }
  // Overwrites the whole buffer (also the part beyond size()) and empties it.
  void Wipe() {
    OPENSSL_cleanse(s_.data(), s_.capacity());
    s_.clear();
  }

  const char* data() const { return s_.data(); }
  char* data() { return s_.data(); }
  size_t size() const { return s_.size(); }
  bool empty() const { return s_.empty(); }
  std::string_view view() const { return {s_.data(), s_.size()}; }
  Base& str() { return s_; }

  bool operator==(const SecureString& other) const { return s_ == other.s_; }

 private:
  Base s_;
};

// Overwrites a plain string that holds a secret (for interfaces that take
// one) when the guard goes away. The string must not have been reallocated
// since the secret went in, or an old buffer keeps a copy.
class WipeOnExit {
 public:
  explicit WipeOnExit(std::string& text) : text_(text) {}
  WipeOnExit(const WipeOnExit&) = delete;
  WipeOnExit& operator=(const WipeOnExit&) = delete;
  ~WipeOnExit() { OPENSSL_cleanse(text_.data(), text_.capacity()); }

 private:
  std::string& text_;
};

}  // namespace Groundwork
