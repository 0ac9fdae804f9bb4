// The runtime application: the process-wide configuration, thread pool and
// scheduler, and the run operation that blocks the main thread.
//
// Start-up order: CreateScratchConfig, defaults, SetAppInfo, InitApp. InitApp
// always installs the application, even when the file cannot be used (it then
// throws after installing it, and the defaults stay in force).
#pragma once

#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>

#include "platform/runtime/config.h"
#include "platform/runtime/scheduler.h"
#include "platform/runtime/thread_pool.h"

namespace Strake::Service {

struct AppInfo {
  std::string name;
  std::string version;
  int64_t buildNumber = 0;
  int64_t reserved = 0;
};

void SetAppInfo(const AppInfo& info);
const AppInfo& GetAppInfo();

class App {
 public:
  explicit App(std::shared_ptr<const Config> config);
  App(const App&) = delete;
  App& operator=(const App&) = delete;

  const Config& GetConfig() const { return *config_; }
  ThreadPool& GetThreadPool() { return pool_; }
  Strake::System::Scheduler& GetScheduler() { return scheduler_; }

  // Blocks until Stop() is called (from any thread).
  void Run();
  void Stop();

 private:
  std::shared_ptr<const Config> config_;
  ThreadPool pool_;
  Strake::System::AsioScheduler scheduler_;
  std::mutex mutex_;
  std::condition_variable cv_;
  bool stopped_ = false;
};

// Installs the process-wide application over `config` and then loads the XML
// file at `path` over the defaults already in it. Applies "log/level" to the
// log threshold and "features/..." to the feature table. Throws
// std::runtime_error when the file cannot be read or parsed; the application
// is installed with the defaults in that case.
void InitApp(std::shared_ptr<Config> config, const std::string& path);

// The process-wide application. When InitApp never ran, one is created over
// an empty configuration on first use.
App* GetApp();

}  // namespace Strake::Service
