#include "platform/util/wiping_json.h"

#include <openssl/crypto.h>

#include <new>

namespace Groundwork {
namespace {

class WipingResource final : public boost::json::memory_resource {
 private:
  // Boost.JSON asks for at most the default alignment, which plain new
  // gives; the aligned forms are there for anything stricter.
  static bool Plain(std::size_t align) { return align <= __STDCPP_DEFAULT_NEW_ALIGNMENT__; }

  void* do_allocate(std::size_t bytes, std::size_t align) override {
    return Plain(align) ? ::operator new(bytes) : ::operator new(bytes, std::align_val_t(align));
  }
  void do_deallocate(void* p, std::size_t bytes, std::size_t align) override {
    OPENSSL_cleanse(p, bytes);
    if (Plain(align)) {
      ::operator delete(p);
    } else {
      ::operator delete(p, std::align_val_t(align));
    }
  }
  bool do_is_equal(const memory_resource& other) const noexcept override { return this == &other; }
};

}  // namespace

boost::json::storage_ptr WipingJsonStorage() {
  static WipingResource resource;
  return boost::json::storage_ptr(&resource);
}

std::string SerializeWiping(const boost::json::value& value) {
  boost::json::serializer serializer;
  serializer.reset(&value);
  std::string out;
  out.resize(512);
  size_t used = 0;
  while (!serializer.done()) {
    if (used == out.size()) {
      std::string bigger;
      bigger.resize(out.size() * 2);
      bigger.replace(0, used, out.data(), used);
      OPENSSL_cleanse(out.data(), out.size());
      out.swap(bigger);
    }
    used += serializer.read(out.data() + used, out.size() - used).size();
  }
  out.resize(used);
  return out;
}

}  // namespace Groundwork
