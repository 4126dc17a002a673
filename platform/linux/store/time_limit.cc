#include "platform/linux/store/time_limit.h"

#include "platform/linux/store/sqlite_library.h"

namespace tavrel {

TimeLimit::TimeLimit(const SqliteConnection& connection, std::chrono::milliseconds time)
    : thread_([this, handle = connection.handle(), time] {
        std::unique_lock lock(mutex_);
        if (ended_.wait_for(lock, time, [this] { return isOver_; })) return;
        hasPassed_ = true;
        sqlite().interrupt(handle);
      }) {}

TimeLimit::~TimeLimit() {
  {
    const std::lock_guard lock(mutex_);
    isOver_ = true;
  }
  ended_.notify_one();
  thread_.join();
}

}  // namespace tavrel
