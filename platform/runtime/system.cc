#include "platform/runtime/system.h"

#include <unistd.h>

namespace Strake::System {

void QuickExit(int status) { _exit(status); }

}  // namespace Strake::System

namespace HostCtl::Host {

void SystemInfo::RegisterProcess(pid_t, int) {}

std::shared_ptr<SystemInfo> GetSystemInfo() { return std::make_shared<SystemInfo>(); }

}  // namespace HostCtl::Host
