// The process-wide providers state of the daemon: clients built from the
// configuration store and spoken to through the KMIP client library.
#pragma once

#include "state/providers.h"

namespace Zyrd::State {

// Created on first use over the host clock; lives until the process ends.
Providers& GlobalProviders();

}  // namespace Zyrd::State
