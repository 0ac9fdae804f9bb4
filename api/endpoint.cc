#include "api/endpoint.h"

#include <sys/resource.h>

#include <algorithm>
#include <charconv>
#include <condition_variable>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <mutex>

#include "platform/runtime/app.h"
#include "platform/util/log.h"

namespace Zyrd::ZyrApi {

namespace asio = boost::asio;
using asio::ip::tcp;

// Shared with the worker tasks, which may start late (a busy pool) or never
// (a pool that shuts down): a task that starts after Stop() does not touch
// the I/O context, and the destructor waits only for tasks that run it.
struct Endpoint::Workers {
  explicit Workers(asio::io_context& context) : io(&context) {}

  void Run() {
    {
      std::lock_guard<std::mutex> lock(mutex);
      if (stopped) return;
      ++running;
    }
    // A handler that throws must not take the worker (or the process) with
    // it: the failure is logged and the loop goes on until Stop().
    for (;;) {
      try {
        io->run();
        break;
      } catch (const std::exception& e) {
        Log_Level(2, "HTTP worker error: %s\n", e.what());
      } catch (...) {
        Log_Level(2, "HTTP worker error: unknown exception\n");
      }
    }
    {
      std::lock_guard<std::mutex> lock(mutex);
      --running;
    }
    idle.notify_all();
  }

  asio::io_context* io;
  std::mutex mutex;
  std::condition_variable idle;
  bool stopped = false;
  int running = 0;
};

Lumo::Transport::ServerConfig Endpoint::MakeServerConfig(
    uint32_t port, std::shared_ptr<Lumo::Log::Logger> logger) {
  Lumo::Transport::ServerConfig config;
  const auto tcpPort = static_cast<uint16_t>(port & 0xffff);
  config.listenOnAllInterfaces = false;
  config.endpoint4 = tcp::endpoint(asio::ip::address_v4::loopback(), tcpPort);
  config.endpoint6 = tcp::endpoint(asio::ip::address_v6::loopback(), tcpPort);
  config.logger = std::move(logger);
  config.readTimeout = std::chrono::minutes(20);
  config.requestTimeout = std::chrono::seconds(20);
  config.writeTimeout = std::chrono::minutes(30);
  config.httpBodySizeLimitInBytes = 2'500'000;
  config.protocolHandlerSpec.maxRequestSize = 2'500'000;
  config.maxConnections = ConnectionLimit();
  return config;
}

size_t Endpoint::ConnectionLimit() {
  // A connection holds one descriptor. Without a bound, connections that sit
  // idle would take the descriptors that key-server connections and the store
  // need, and a usual soft limit of 1024 is just short of the bound.
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return kMaxConnections;
  const rlim_t wanted = std::min<rlim_t>(kMaxConnections + kReservedDescriptors, limit.rlim_max);
  if (limit.rlim_cur < wanted) {
    rlimit raised = limit;
    raised.rlim_cur = wanted;
    if (setrlimit(RLIMIT_NOFILE, &raised) == 0) limit = raised;
  }
  const rlim_t usable = limit.rlim_cur > 2 * kReservedDescriptors
                            ? limit.rlim_cur - kReservedDescriptors
                            : limit.rlim_cur / 2;
  return static_cast<size_t>(std::min<rlim_t>(kMaxConnections, std::max<rlim_t>(usable, 1)));
}

Endpoint::Endpoint(uint32_t port, asio::io_context& io, Lumo::Transport::HttpCallHandler handler,
                   std::shared_ptr<Lumo::Log::Logger> logger)
    : port_(port),
      io_(io),
      server_(io, MakeServerConfig(port, logger), std::move(handler)),
      logger_(std::move(logger)),
      workers_(std::make_shared<Workers>(io)) {}

Endpoint::~Endpoint() {
  Stop();
  {
    std::unique_lock<std::mutex> lock(workers_->mutex);
    workers_->idle.wait(lock, [this] { return workers_->running == 0; });
  }
  work_.reset();
  server_.Close();
}

bool Endpoint::Start() {
  const auto result = server_.Listen();
  if (!result.Any()) return false;
  port_ = result.ipv4 ? server_.Endpoint6().port() : server_.Endpoint4().port();

  work_.emplace(io_.get_executor());
  auto& pool = Strake::Service::GetApp()->GetThreadPool();
  // Each worker runs the I/O loop for good: a pool smaller than that would
  // leave some of them waiting for ever.
  const size_t before = pool.RaiseMaxThreads(kWorkerCount);
  if (before < static_cast<size_t>(kWorkerCount)) {
    Log_Level(3, "Thread pool raised from %zu to %d threads, one for each HTTP worker\n", before,
              kWorkerCount);
  }
  for (int i = 0; i < kWorkerCount; ++i) {
    pool.Enqueue([workers = workers_] { workers->Run(); });
  }
  Log_Level(5, "HTTP endpoint listening on TCP port %d\n", static_cast<int>(port_));
  return true;
}

void Endpoint::Stop() {
  {
    std::lock_guard<std::mutex> lock(workers_->mutex);
    workers_->stopped = true;
  }
  io_.stop();
}

uint32_t HttpPortFromEnvironment() {
  const char* text = std::getenv("ZYRD_HTTP_PORT");
  if (text == nullptr) return Endpoint::kDefaultPort;
  uint32_t port = 0;
  const char* end = text + std::strlen(text);
  auto [next, ec] = std::from_chars(text, end, port);
  if (ec != std::errc() || next != end || next == text || port > 65535) {
    Log_Level(3, "Ignoring ZYRD_HTTP_PORT '%s': not a port number; using %u\n", text,
              Endpoint::kDefaultPort);
    return Endpoint::kDefaultPort;
  }
  return port;
}

}  // namespace Zyrd::ZyrApi
