// Child processes and scratch directories for tests.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "tests/support/temp_dir.h"

namespace ZyrdTest {

// Runs argv[0] (a full path) with the arguments, waits, and returns its exit
// status (-1 when it could not run or died by a signal). Standard output is
// collected into `out`, standard error into `err` when given.
int RunProcess(const std::vector<std::string>& argv, std::string* out, std::string* err = nullptr);

// A started child process; SIGKILLed and reaped if still running when the
// object goes away.
class ChildProcess {
 public:
  // Starts argv with standard input from /dev/null and both outputs appended
  // to `log_path`. Check Running() afterwards.
  ChildProcess(const std::vector<std::string>& argv, const std::string& log_path);
  ~ChildProcess();
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;

  bool Running();
  // Sends `sig` and waits up to `grace` for the exit; then SIGKILL. Returns
  // whether it exited within the grace period.
  bool Stop(int sig, std::chrono::milliseconds grace);

 private:
  pid_t pid_ = -1;
};

// A TCP port on 127.0.0.1 that was free a moment ago.
uint16_t FreeLoopbackPort();

// Whether something accepts TCP connections on 127.0.0.1:port.
bool AcceptsConnections(uint16_t port);

// Reads a whole file ("" when it cannot).
std::string ReadTextFile(const std::filesystem::path& path);

}  // namespace ZyrdTest
