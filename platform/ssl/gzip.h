// gzip compression of texts (RFC 1952, so `gzip -d` reads what Compress
// writes), on zlib.
//
// Texts that pass through here may hold secrets (a configuration export
// carries credentials and private keys), so outputs are wiping strings: a
// buffer they outgrow is overwritten before it is released. Thread-safe; no
// function logs.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "platform/util/secure_buffer.h"

namespace Kestrel::Common::Gzip {

// Upper bound of a decompressed text unless the caller names another.
inline constexpr size_t kDefaultMaxDecompressedSize = size_t{64} << 20;  // 64 MiB

// Replaces `out` with one gzip member holding `in`. False (with `out`
// emptied) only when zlib fails.
bool CompressFromString(std::string_view in, Groundwork::SecureString& out);

// Replaces `out` with the text that the gzip data `in` holds (one member, or
// several concatenated ones, as gzip writes for appended files). Fails, with
// `out` emptied and, when given, `reason` saying why, on anything that is
// not complete gzip data (a zlib stream or raw deflate data included), on
// trailing bytes, and as soon as the text would exceed `maxSize` bytes, so a
// small input cannot make it allocate more than that.
bool DecompressToString(std::string_view in, Groundwork::SecureString& out,
                        size_t maxSize = kDefaultMaxDecompressedSize,
                        std::string* reason = nullptr);

}  // namespace Kestrel::Common::Gzip
