#include "platform/runtime/app.h"

#include <algorithm>

#include "platform/util/feature_state.h"
#include "platform/util/log.h"

namespace Strake::Service {
namespace {

AppInfo gAppInfo;
std::mutex gAppMutex;
std::unique_ptr<App> gApp;

size_t PoolSize(const Config& config) {
  int64_t io = config.GetInt("strake/threadPool/ioThreads", 1);
  int64_t max = config.GetInt("strake/threadPool/maxThreads", 10);
  return static_cast<size_t>(std::clamp<int64_t>(std::max(io, max), 1, 256));
}

void ApplySettings(const Config& config) {
  std::string level = config.GetString("log/level", "info");
  int threshold = 5;
  if (Groundwork::ParseLogLevel(level, &threshold)) {
    Groundwork::SetLogThreshold(threshold);
  } else {
    Groundwork::SetLogThreshold(5);
    Log_Level(3, "Unknown log level '%s', using info\n", level.c_str());
  }
  FeatureState_Set(kFeatureCredentialGet, config.GetBool("features/credentialGet", false));
}

}  // namespace

void SetAppInfo(const AppInfo& info) { gAppInfo = info; }
const AppInfo& GetAppInfo() { return gAppInfo; }

App::App(std::shared_ptr<const Config> config)
    : config_(std::move(config)), pool_(PoolSize(*config_), "worker-") {}

void App::Run() {
  std::unique_lock<std::mutex> lock(mutex_);
  cv_.wait(lock, [this] { return stopped_; });
}

void App::Stop() {
  {
    std::lock_guard<std::mutex> lock(mutex_);
    stopped_ = true;
  }
  cv_.notify_all();
}

void InitApp(std::shared_ptr<Config> config, const std::string& path) {
  std::exception_ptr failure;
  try {
    config->MergeXmlFile(path);
  } catch (...) {
    failure = std::current_exception();
  }
  ApplySettings(*config);
  {
    std::lock_guard<std::mutex> lock(gAppMutex);
    gApp = std::make_unique<App>(std::move(config));
  }
  if (failure) std::rethrow_exception(failure);
}

App* GetApp() {
  std::lock_guard<std::mutex> lock(gAppMutex);
  if (!gApp) gApp = std::make_unique<App>(CreateScratchConfig());
  return gApp.get();
}

}  // namespace Strake::Service
