// Termination signals.
//
// SignalsInit installs handlers for SIGTERM and SIGINT. The handler only
// writes a byte to a pipe; a watcher thread reads it and calls the callback,
// so the callback runs on an ordinary thread (it may log, lock and exit) and
// runs at most once however many signals arrive.
#pragma once

#include <functional>

namespace Kestrel::Common::SignalUtils {

// Returns false when the handlers or the watcher could not be set up (and
// then nothing is installed). A second call while installed fails.
bool SignalsInit(std::function<void()> callback);

// Restores the default dispositions. Safe to call from the callback itself,
// and when SignalsInit never ran.
void SignalsExit();

}  // namespace Kestrel::Common::SignalUtils
