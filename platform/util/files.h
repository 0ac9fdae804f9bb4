// Small file-system helpers shared by the platform layers and tools that
// keep files under the root: creating directories, reading and writing whole
// buffers, and replacing a file atomically.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <string>
#include <string_view>

#include "platform/util/secure_buffer.h"

namespace Groundwork {

// Creates each missing directory of the absolute path `dir` with `mode`;
// directories that exist are left as they are. Returns whether `dir` is a
// directory afterwards.
bool MakeDirectories(const std::string& dir, mode_t mode);

// Writes all of `data` to `fd`, retrying after interruptions and short
// writes. False (errno set) on the first failure.
bool WriteAll(int fd, const char* data, size_t size);

// Reads everything from `fd` (the file `path`; "-" is standard input) into
// `out`, with no buffer of its own, since the text may hold a key. False
// (errno set) when it cannot be read; `out` then holds nothing.
bool ReadAll(int fd, SecureString* out);
bool ReadSecretFile(const std::string& path, SecureString* out);

// Replaces the file `path` with `content`, readable with `mode`, so that a
// reader or a crash sees either the old file or the new one in full: the
// text goes to a fresh temporary file in the same directory, which is
// flushed to disk, renamed over `path`, and then the directory is flushed.
// A symbolic link at `path` is replaced, not followed. False, with `error`
// saying what failed, when nothing changed at `path`; once the rename is
// done the result is true.
bool ReplaceFile(const std::string& path, std::string_view content, mode_t mode,
                 std::string* error);

}  // namespace Groundwork
