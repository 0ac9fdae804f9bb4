#include "platform/runtime/thread_pool.h"

#include <algorithm>

#include "platform/util/log.h"

namespace Strake::Service {

ThreadPool::ThreadPool(size_t maxThreads, std::string threadNamePrefix)
    : prefix_(std::move(threadNamePrefix)), maxThreads_(maxThreads == 0 ? 1 : maxThreads) {}

size_t ThreadPool::MaxThreads() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return maxThreads_;
}

size_t ThreadPool::RaiseMaxThreads(size_t threads) {
  std::lock_guard<std::mutex> lock(mutex_);
  const size_t before = maxThreads_;
  maxThreads_ = std::max(maxThreads_, threads);
  return before;
}

ThreadPool::~ThreadPool() {
  {
    std::lock_guard<std::mutex> lock(mutex_);
    stopping_ = true;
    queue_.clear();
  }
  cv_.notify_all();
  for (auto& t : threads_) t.join();
}

void ThreadPool::Enqueue(std::function<void()> task) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (stopping_) return;
  queue_.push_back(std::move(task));
  // Every queued task needs a thread of its own: idle threads that have not
  // woken yet are already spoken for by the tasks queued before this one.
  if (queue_.size() > idle_ && threads_.size() < maxThreads_) {
    size_t index = threads_.size();
    threads_.emplace_back([this, index] { Worker(index); });
  } else {
    cv_.notify_one();
  }
}

void ThreadPool::Worker(size_t index) {
  Groundwork::SetLogThreadName(prefix_ + std::to_string(index));
  std::unique_lock<std::mutex> lock(mutex_);
  for (;;) {
    ++idle_;
    cv_.wait(lock, [this] { return stopping_ || !queue_.empty(); });
    --idle_;
    if (stopping_) return;
    auto task = std::move(queue_.front());
    queue_.pop_front();
    lock.unlock();
    task();
    lock.lock();
  }
}

}  // namespace Strake::Service
