#include "platform/ssl/gzip.h"

#include <zlib.h>

#include <algorithm>
#include <climits>

namespace Kestrel::Common::Gzip {
namespace {

// windowBits for deflateInit2/inflateInit2: a 32 KiB window, gzip wrapper.
constexpr int kGzipWindowBits = 15 + 16;
constexpr size_t kChunk = 64 * 1024;

// zlib counts in uInt; feed it at most this much at a time.
constexpr size_t kMaxFeed = UINT_MAX;

bool Fail(Groundwork::SecureString& out, std::string* reason, const char* why) {
  out.Wipe();
  if (reason != nullptr) *reason = why;
  return false;
}

}  // namespace

bool CompressFromString(std::string_view in, Groundwork::SecureString& out) {
  out.Wipe();
  z_stream z{};
  if (deflateInit2(&z, Z_BEST_COMPRESSION, Z_DEFLATED, kGzipWindowBits, 8, Z_DEFAULT_STRATEGY) !=
      Z_OK) {
    return false;
  }
  auto& buffer = out.str();
  // deflateBound gives a size that one call is sure to fit into, so the
  // buffer (which may hold the text compressed) is allocated once.
  buffer.resize(deflateBound(&z, static_cast<uLong>(std::min(in.size(), size_t{ULONG_MAX}))));
  z.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(in.data()));
  size_t remaining = in.size();
  size_t produced = 0;
  int rc = Z_OK;
  while (rc == Z_OK) {
    size_t feed = std::min(remaining, kMaxFeed);
    z.avail_in = static_cast<uInt>(feed);
    if (produced == buffer.size()) buffer.resize(buffer.size() + kChunk);
    z.next_out = reinterpret_cast<Bytef*>(buffer.data() + produced);
    z.avail_out = static_cast<uInt>(std::min(buffer.size() - produced, kMaxFeed));
    const size_t before = z.avail_out;
    rc = deflate(&z, feed == remaining ? Z_FINISH : Z_NO_FLUSH);
    produced += before - z.avail_out;
    remaining -= feed - z.avail_in;
  }
  deflateEnd(&z);
  if (rc != Z_STREAM_END) {
    out.Wipe();
    return false;
  }
  buffer.resize(produced);
  return true;
}

bool DecompressToString(std::string_view in, Groundwork::SecureString& out, size_t maxSize,
                        std::string* reason) {
  out.Wipe();
  if (in.empty()) return Fail(out, reason, "no data");
  z_stream z{};
  if (inflateInit2(&z, kGzipWindowBits) != Z_OK) return Fail(out, reason, "zlib failed");
  auto& buffer = out.str();
  z.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(in.data()));
  size_t remaining = in.size();
  size_t produced = 0;
  const char* failure = nullptr;
  // The buffer grows to one byte beyond the bound at most: a text that
  // fills that byte is too large.
  const size_t capacity = maxSize + 1;
  for (;;) {
    size_t feed = std::min(remaining, kMaxFeed);
    z.avail_in = static_cast<uInt>(feed);
    if (produced == buffer.size()) {
      buffer.resize(std::min(capacity, std::max(buffer.size() * 2, kChunk)));
    }
    z.next_out = reinterpret_cast<Bytef*>(buffer.data() + produced);
    z.avail_out = static_cast<uInt>(std::min(buffer.size() - produced, kMaxFeed));
    const size_t before = z.avail_out;
    int rc = inflate(&z, Z_NO_FLUSH);
    const size_t made = before - z.avail_out;
    remaining -= feed - z.avail_in;
    produced += made;
    if (produced > maxSize) {
      failure = "the text exceeds the size limit";
      break;
    }
    if (rc == Z_STREAM_END) {
      if (remaining == 0) break;
      // Another member follows (gzip writes one per appended file).
      if (inflateReset(&z) != Z_OK) {
        failure = "zlib failed";
        break;
      }
      continue;
    }
    if (rc == Z_BUF_ERROR && remaining == 0 && made == 0) {
      failure = "the gzip data is truncated";
      break;
    }
    if (rc != Z_OK && rc != Z_BUF_ERROR) {
      failure = rc == Z_MEM_ERROR ? "zlib ran out of memory" : "not gzip data";
      break;
    }
  }
  inflateEnd(&z);
  if (failure != nullptr) return Fail(out, reason, failure);
  buffer.resize(produced);
  return true;
}

}  // namespace Kestrel::Common::Gzip
