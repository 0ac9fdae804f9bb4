// Fuzzes the parser of the store's export text (what import accepts):
// nothing may crash, and whatever it accepts must export to a text that it
// accepts again and that exports unchanged.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "platform/configstore/export_codec.h"

using namespace OrnaConfigStore::Codec;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view text(reinterpret_cast<const char*>(data), size);
  ExportContents contents;
  std::string error;
  if (!DecodeExport(text, contents, error)) {
    if (error.empty()) abort();
    return 0;
  }
  std::string exported = EncodeExport(contents.scopes, contents.objects);
  ExportContents again;
  if (!DecodeExport(exported, again, error)) abort();
  if (EncodeExport(again.scopes, again.objects) != exported) abort();
  return 0;
}
