#include "platform/ssl/signal_utils.h"

#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <mutex>
#include <thread>

#include "platform/util/log.h"

namespace Kestrel::Common::SignalUtils {
namespace {

constexpr int kSignals[] = {SIGTERM, SIGINT};

std::mutex gMutex;
bool gInstalled = false;
int gPipe[2] = {-1, -1};
std::atomic<int> gWriteFd{-1};

void OnSignal(int) {
  int saved = errno;
  int fd = gWriteFd.load(std::memory_order_relaxed);
  if (fd >= 0) {
    char byte = 1;
    ssize_t ignored = ::write(fd, &byte, 1);
    (void)ignored;
  }
  errno = saved;
}

void Watch(int readFd, std::function<void()> callback) {
  Groundwork::SetLogThreadName("signals");
  char byte;
  for (;;) {
    ssize_t n = ::read(readFd, &byte, 1);
    if (n == 1) break;
    if (n < 0 && errno == EINTR) continue;
    return;  // pipe closed: uninstalled without a signal
  }
  callback();
}

}  // namespace

bool SignalsInit(std::function<void()> callback) {
  std::lock_guard<std::mutex> lock(gMutex);
  if (gInstalled || !callback) return false;
  if (::pipe2(gPipe, O_CLOEXEC) != 0) return false;
  gWriteFd.store(gPipe[1]);

  struct sigaction sa {};
  sa.sa_handler = OnSignal;
  sigemptyset(&sa.sa_mask);
  sa.sa_flags = SA_RESTART;
  for (int sig : kSignals) {
    if (sigaction(sig, &sa, nullptr) != 0) {
      for (int s : kSignals) signal(s, SIG_DFL);
      gWriteFd.store(-1);
      ::close(gPipe[0]);
      ::close(gPipe[1]);
      return false;
    }
  }
  try {
    std::thread(Watch, gPipe[0], std::move(callback)).detach();
  } catch (const std::system_error&) {
    for (int s : kSignals) signal(s, SIG_DFL);
    gWriteFd.store(-1);
    ::close(gPipe[0]);
    ::close(gPipe[1]);
    return false;
  }
  gInstalled = true;
  return true;
}

void SignalsExit() {
  std::lock_guard<std::mutex> lock(gMutex);
  if (!gInstalled) return;
  for (int sig : kSignals) signal(sig, SIG_DFL);
  // The watcher keeps its read end; the process is about to leave, and
  // closing the pipe under a running callback would gain nothing.
  gInstalled = false;
}

}  // namespace Kestrel::Common::SignalUtils
