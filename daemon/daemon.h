// Process entry of zyrd: the start-up sequence, the termination-signal hook
// and the single exit routine.
#pragma once

namespace Zyrd {

namespace ZyrApi {
class Endpoint;
}

// Runs the daemon: start-up in its fixed order, then blocks the calling (main)
// thread until a termination signal ends the process. Never returns.
[[noreturn]] void RunDaemon();

// Installs the SIGTERM/SIGINT callback, which leaves through ExitDaemon with
// status 0 and `endpoint`. Returns whether installation succeeded.
bool InitSignals(ZyrApi::Endpoint* endpoint);

// The single way out of the process: logs "Exiting with status %d", removes
// the signal handlers, stops `endpoint` when one is given (it may be null),
// releases process-wide resources and ends the process at once with `status`.
[[noreturn]] void ExitDaemon(int status, ZyrApi::Endpoint* endpoint);

}  // namespace Zyrd
