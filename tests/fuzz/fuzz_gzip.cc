// Fuzzes gzip decompression (what raw configuration set inflates): nothing
// may crash or exceed the bound, and whatever inflates must compress and
// inflate back to itself.
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "platform/ssl/gzip.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  constexpr size_t kLimit = 1 << 20;
  using namespace Kestrel::Common::Gzip;
  Groundwork::SecureString text;
  if (!DecompressToString(std::string_view(reinterpret_cast<const char*>(data), size), text,
                          kLimit)) {
    return 0;
  }
  if (text.size() > kLimit) abort();
  Groundwork::SecureString gz, again;
  if (!CompressFromString(text.view(), gz) || !DecompressToString(gz.view(), again, kLimit) ||
      !(again == text)) {
    abort();
  }
  return 0;
}
