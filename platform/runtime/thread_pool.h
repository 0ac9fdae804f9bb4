// A pool of worker threads. Each queued task runs on a pool thread of its own
// as soon as one is free; threads are started on demand up to `maxThreads`, so
// long-running tasks (an I/O loop each) do not starve one another while the
// pool has room. Enqueue is thread-safe.
#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace Strake::Service {

class ThreadPool {
 public:
  ThreadPool(size_t maxThreads, std::string threadNamePrefix);
  ~ThreadPool();  // waits for running tasks to return; queued ones are dropped
  ThreadPool(const ThreadPool&) = delete;
  ThreadPool& operator=(const ThreadPool&) = delete;

  void Enqueue(std::function<void()> task);

  size_t MaxThreads() const;
  // Raises the bound to at least `threads` (for callers whose tasks must
  // all run at once); returns the bound before.
  size_t RaiseMaxThreads(size_t threads);

 private:
  void Worker(size_t index);

  const std::string prefix_;
  mutable std::mutex mutex_;
  size_t maxThreads_;  // guarded by mutex_
  std::condition_variable cv_;
  std::deque<std::function<void()>> queue_;
  std::vector<std::thread> threads_;
  size_t idle_ = 0;
  bool stopping_ = false;
};

}  // namespace Strake::Service
