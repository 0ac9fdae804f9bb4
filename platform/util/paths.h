// Every absolute path the daemon uses lives under the root named by the
// environment variable ZYRD_ROOT (default "/"), so a whole installation can
// run from a scratch directory.
#pragma once

#include <string>
#include <string_view>

namespace Groundwork {

// The root directory, read from ZYRD_ROOT on every call ("/" when unset or
// empty).
std::string RootDir();

// `absolute` (e.g. "/var/lib/zyrd/configstore.db") placed under RootDir().
std::string RootPath(std::string_view absolute);

}  // namespace Groundwork
