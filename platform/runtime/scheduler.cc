#include "platform/runtime/scheduler.h"

#include <boost/asio/post.hpp>

#include "platform/util/log.h"

namespace Strake::System {

AsioScheduler::AsioScheduler() : work_(io_.get_executor()) {
  thread_ = std::thread([this] {
    Groundwork::SetLogThreadName("scheduler");
    io_.run();
  });
}

AsioScheduler::~AsioScheduler() {
  work_.reset();
  io_.stop();
  if (thread_.joinable()) {
    if (thread_.get_id() == std::this_thread::get_id()) {
      thread_.detach();
    } else {
      thread_.join();
    }
  }
}

ScheduledItem AsioScheduler::Schedule(std::chrono::microseconds delay, std::function<void()> fn) {
  auto timer = std::make_shared<boost::asio::steady_timer>(io_, delay);
  timer->async_wait([timer, fn = std::move(fn)](const boost::system::error_code& ec) {
    if (!ec) fn();
  });
  std::weak_ptr<boost::asio::steady_timer> weak = timer;
  return ScheduledItem([this, weak] {
    // Cancel on the scheduler's own thread: timers are not thread-safe.
    boost::asio::post(io_, [weak] {
      if (auto t = weak.lock()) t->cancel();
    });
  });
}

}  // namespace Strake::System
