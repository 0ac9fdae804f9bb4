// Process exit and host information.
#pragma once

#include <sys/types.h>

#include <memory>
#include <stdexcept>
#include <string>

namespace Strake::System {

// Ends the process at once with `status`: no static destructors, no atexit
// handlers, no stdio flushing (the log writes unbuffered).
[[noreturn]] void QuickExit(int status);

}  // namespace Strake::System

namespace HostCtl {

namespace Lib {
// Base class of the exceptions thrown by the host-control family of libraries.
class HostCtlException : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};
}  // namespace Lib

namespace Host {

// Host system information. This stand-alone build has no host agent to
// register with, so its operations do nothing.
class SystemInfo {
 public:
  void RegisterProcess(pid_t pid, int flags);
};

std::shared_ptr<SystemInfo> GetSystemInfo();

}  // namespace Host
}  // namespace HostCtl
