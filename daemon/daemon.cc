#include "daemon/daemon.h"

#include <unistd.h>

#include <cstdio>
#include <exception>
#include <memory>
#include <string>

#include "config/config_transfer.h"
#include "api/provider.h"
#include "daemon/logger.h"
#include "daemon/settings.h"
#include "daemon/stats.h"
#include "errors/message_catalogue.h"
#include "platform/lumo/localizer.h"
#include "platform/runtime/app.h"
#include "platform/runtime/system.h"
#include "platform/ssl/signal_utils.h"
#include "platform/ssl/trackers.h"
#include "platform/util/feature_state.h"
#include "platform/util/log.h"
#include "platform/util/paths.h"
#include "platform/util/ssl_init.h"

namespace Zyrd {
namespace {

using Kestrel::Common::StrakeLumo::ErrorsTracker;
using Kestrel::Common::StrakeLumo::TrafficTracker;

// The provider lookup of a daemon without a providers state: it knows no
// provider, so key operations answer not_found.
class NoProviders final : public State::ProviderLookup {
 public:
  std::shared_ptr<Kms::Kms> GetProvider(const std::string&) override { return nullptr; }
};

// vouchd's key comes from the configuration store; without one, attestation
// tokens cannot be checked and only the admin token authenticates.
bool ReadVouchdPublicKey(std::string&) { return false; }

void ReportRuntimeInitFailure(const std::exception& e) {
  std::string line = std::string("Initializing strake failed: ") + e.what() + "\n";
  fputs(line.c_str(), stderr);
  fflush(stderr);
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

bool InitSignals() {
  return Kestrel::Common::SignalUtils::SignalsInit([] { ExitDaemon(0); });
}

void ExitDaemon(int status) {
  Log_Level(3, "Exiting with status %d\n", status);
  Kestrel::Common::SignalUtils::SignalsExit();
  SSL_Exit();
  Strake::System::QuickExit(status);
}

void RunDaemon() {
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

    auto localizer = std::make_shared<const Lumo::L10n::Localizer>(
        std::vector<std::string>{"en_US"}, ZyrApi::ResolveMessage);

    // Every task runs at once on the thread that hands it over.
    Lumo::Executor executor = [](std::function<void()> task) { task(); };
    ZyrApi::ProviderDependencies deps = ZyrApi::DefaultDependencies();
    deps.providers = std::make_shared<NoProviders>();
    deps.readVouchdPublicKey = ReadVouchdPublicKey;
    Lumo::Provider::ApiProviderPtr apiProvider =
        ZyrApi::CreateLocalProvider(executor, loggerWrapper, deps);

    Strake::Service::App* app = Strake::Service::GetApp();
    Stats::Global().Start(app->GetConfig(), app->GetScheduler());

    if (!InitSignals()) {
      Log_Level(2, "Failed to install signal handlers. Exiting.\n");
      errorsTracker->Stop();
      trafficTracker->SetStopped(true);
      ExitDaemon(1);
    }
    app->Run();

    trafficTracker->SetStopped(true);
    apiProvider.reset();
    localizer.reset();
    loggerWrapper.reset();
    errorsTracker->Stop();
    trafficTracker->SetStopped(true);
    ExitDaemon(0);
  } catch (const std::exception& e) {
    Log_Level(2, "Exiting with error: %s\n", e.what());
    errorsTracker->Stop();
    trafficTracker->SetStopped(true);
    ExitDaemon(1);
  }
}

}  // namespace Zyrd
