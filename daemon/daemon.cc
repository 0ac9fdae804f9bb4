#include "daemon/daemon.h"

#include <malloc.h>
#include <unistd.h>

#include <boost/asio/io_context.hpp>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <memory>
#include <string>

#include "api/endpoint.h"
#include "api/provider.h"
#include "config/config_transfer.h"
#include "config/provider_config.h"
#include "daemon/logger.h"
#include "daemon/settings.h"
#include "daemon/stats.h"
#include "errors/message_catalogue.h"
#include "platform/lumo/jsonrpc.h"
#include "platform/lumo/localizer.h"
#include "platform/runtime/app.h"
#include "platform/runtime/system.h"
#include "platform/ssl/signal_utils.h"
#include "platform/ssl/trackers.h"
#include "platform/util/feature_state.h"
#include "platform/util/log.h"
#include "platform/util/paths.h"
#include "platform/util/ssl_init.h"
#include "state/firewall.h"
#include "state/global_providers.h"

namespace Zyrd {
namespace {

using Kestrel::Common::StrakeLumo::ErrorsTracker;
using Kestrel::Common::StrakeLumo::TrafficTracker;

void ReportRuntimeInitFailure(const std::exception& e) {
  std::string line =
      std::string("Initializing strake failed: ") + Groundwork::EscapeForLog(e.what()) + "\n";
  fputs(line.c_str(), stderr);
  fflush(stderr);
}

// The daemon's threads (HTTP workers, scheduler, signal watcher) allocate
// small, short-lived blocks, and a block is often freed on another thread
// than the one that allocated it. With glibc's default of one malloc arena per
// thread (up to eight per core), each arena keeps its own free space and
// reaches its own high-water mark, so resident memory creeps up for a long
// time under steady load although the live heap does not grow. One arena
// shared by all threads reuses every freed block; the per-thread caches in
// front of it keep the common allocation path free of its lock. Must run
// before any thread starts; MALLOC_ARENA_MAX in the environment, when set,
// is left in force.
void LimitMallocArenas() {
  if (std::getenv("MALLOC_ARENA_MAX") != nullptr) return;
  if (mallopt(M_ARENA_MAX, 1) != 1) Log_Level(3, "Cannot limit the malloc arenas\n");
}

// Steps 1-3: feature table, OpenSSL, and the runtime over the defaults and
// the configuration file. Failures here never stop start-up.
void InitRuntime() {
  FeatureState_Init();
  SSL_Init(nullptr, nullptr, nullptr);

  std::shared_ptr<Strake::Service::Config> config;
  try {
    config = Strake::Service::CreateScratchConfig();
    Settings::WriteDefaults(*config);
    Strake::Service::SetAppInfo({"zyrd", ZYRD_VERSION, ZYRD_BUILD_NUMBER, 0});
  } catch (const std::exception& e) {
    ReportRuntimeInitFailure(e);
    return;
  }
  try {
    Strake::Service::InitApp(config, Groundwork::RootPath(Settings::kConfigPath));
  } catch (const std::exception& e) {
    ReportRuntimeInitFailure(e);
  }
}

}  // namespace

bool InitSignals(ZyrApi::Endpoint* endpoint) {
  return Kestrel::Common::SignalUtils::SignalsInit([endpoint] { ExitDaemon(0, endpoint); });
}

void ExitDaemon(int status, ZyrApi::Endpoint* endpoint) {
  Log_Level(3, "Exiting with status %d\n", status);
  Kestrel::Common::SignalUtils::SignalsExit();
  if (endpoint != nullptr) endpoint->Stop();
  State::GlobalFirewall().CloseAll();
  SSL_Exit();
  Strake::System::QuickExit(status);
}

void RunDaemon() {
  LimitMallocArenas();
  Groundwork::SetLogThreadName("main");
  InitRuntime();

  auto defaultLogger = Strake::Service::Logger::sDefaultLogger;
  auto trafficTracker = std::make_shared<TrafficTracker>(defaultLogger);
  auto errorsTracker = std::make_shared<ErrorsTracker>(defaultLogger);

  try {
    HostCtl::Host::GetSystemInfo()->RegisterProcess(getpid(), 0);

    ZyrApi::GetDaemonLogger();
    auto loggerWrapper = std::make_shared<ZyrApi::LumoLoggerWrapper>(&Log_Level);

    Config::RestoreConfig();
    State::GlobalFirewall().OpenAll();

    auto localizer = std::make_shared<const Lumo::L10n::Localizer>(
        std::vector<std::string>{"en_US"}, ZyrApi::ResolveMessage);

    // Every task runs at once on the thread that hands it over.
    Lumo::Executor executor = [](std::function<void()> task) { task(); };
    State::Providers& providers = State::GlobalProviders();
    ZyrApi::ProviderDependencies deps = ZyrApi::DefaultDependencies();
    // The providers state is process-wide and outlives every request.
    deps.providers =
        std::shared_ptr<State::ProviderLookup>(&providers, [](State::ProviderLookup*) {});
    deps.readVouchdPublicKey = [](std::string& key) { return Config::ReadVouchdPublicKey(key); };
    Lumo::Provider::ApiProviderPtr apiProvider =
        ZyrApi::CreateLocalProvider(executor, loggerWrapper, deps);

    auto io = std::make_unique<boost::asio::io_context>();
    auto endpoint = std::make_unique<ZyrApi::Endpoint>(
        ZyrApi::HttpPortFromEnvironment(), *io,
        Lumo::Protocol::MakeJsonRpcHandler(apiProvider, localizer, loggerWrapper), loggerWrapper);

    Strake::Service::App* app = Strake::Service::GetApp();
    providers.Configure(app->GetConfig(), app->GetScheduler());
    Stats::Global().Start(app->GetConfig(), app->GetScheduler());

    // Releases what start-up built, in reverse order of construction.
    auto releaseApi = [&] {
      endpoint.reset();
      io.reset();
      apiProvider.reset();
      localizer.reset();
      loggerWrapper.reset();
    };

    if (!endpoint->Start()) {
      Log_Level(2, "HTTP endpoint failed to start. Exiting.\n");
      releaseApi();
      errorsTracker->Stop();
      trafficTracker->SetStopped(true);
      ExitDaemon(1, nullptr);
    }

    int status = 0;
    if (InitSignals(endpoint.get())) {
      app->Run();
    } else {
      Log_Level(2, "Failed to install signal handlers. Exiting.\n");
      status = 1;
    }

    trafficTracker->SetStopped(true);
    endpoint->Stop();
    releaseApi();
    errorsTracker->Stop();
    trafficTracker->SetStopped(true);
    ExitDaemon(status, nullptr);
  } catch (const std::exception& e) {
    Log_Level(2, "Exiting with error: %s\n", e.what());
    errorsTracker->Stop();
    trafficTracker->SetStopped(true);
    ExitDaemon(1, nullptr);
  }
}

}  // namespace Zyrd
