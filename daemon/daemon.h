// Process entry of zyrd: the start-up sequence, the termination-signal hook
// and the single exit routine.
#pragma once

namespace Zyrd {

// Runs the daemon: start-up in its fixed order, then blocks the calling (main)
// thread until a termination signal ends the process. Never returns.
[[noreturn]] void RunDaemon();

// Installs the SIGTERM/SIGINT callback, which leaves through ExitDaemon with
// status 0. Returns whether installation succeeded.
bool InitSignals();

// The single way out of the process: logs "Exiting with status %d", removes
// the signal handlers, releases process-wide resources and ends the process
// at once with `status`.
[[noreturn]] void ExitDaemon(int status);

}  // namespace Zyrd
