#include "config/config_lock.h"

namespace Zyrd::Config {

UserLock::RWLock& ConfigLock() {
  static const UserLock::RWLockPtr lock("configLock", kConfigLockRank);
  return *lock;
}

}  // namespace Zyrd::Config
