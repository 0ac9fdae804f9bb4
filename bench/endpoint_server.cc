// The daemon's HTTP endpoint with a handler that answers every call with the
// fixed reply: the transport's cost without any API work behind it.
// Usage: endpoint_server [port]   (0 or nothing: a free port)
// Prints "port <n>" once listening; stops on SIGINT or SIGTERM.
#include <signal.h>

#include <cstdio>
#include <cstdlib>
#include <memory>

#include "api/endpoint.h"
#include "bench/fixed_reply.h"
#include "daemon/logger.h"
#include "platform/util/log.h"

int main(int argc, char** argv) {
  const uint32_t port = argc > 1 ? static_cast<uint32_t>(std::atoi(argv[1])) : 0;
  Groundwork::SetLogThreshold(3);

  // The workers inherit this mask, so only sigwait below sees the signals.
  sigset_t stopSignals;
  sigemptyset(&stopSignals);
  sigaddset(&stopSignals, SIGINT);
  sigaddset(&stopSignals, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);

  boost::asio::io_context io;
  auto handler = [](std::shared_ptr<Lumo::Transport::HttpCall>,
                    std::function<void(Lumo::Transport::HttpCallResult)> done) {
    done({std::string(ZyrdBench::kFixedReply), ""});
  };
  Zyrd::ZyrApi::Endpoint endpoint(port, io, handler,
                                  std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level));
  if (!endpoint.Start()) return 1;
  std::printf("port %u\n", endpoint.Port());
  std::fflush(stdout);

  int signal = 0;
  sigwait(&stopSignals, &signal);
  endpoint.Stop();
  return 0;
}
