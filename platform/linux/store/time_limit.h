// A time limit for a query that could take long.
//
//   const TimeLimit limit(connection, std::chrono::seconds(1));
//   while (statement.step()) ...  // throws once the limit has passed
#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <thread>

#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// Interrupts the connection's work after `time`. The connection must outlive it.
class TimeLimit {
 public:
  TimeLimit(const SqliteConnection& connection, std::chrono::milliseconds time);
  ~TimeLimit();
  TimeLimit(const TimeLimit&) = delete;
  TimeLimit& operator=(const TimeLimit&) = delete;

  bool hasPassed() const { return hasPassed_; }

 private:
  std::mutex mutex_;
  std::condition_variable ended_;
  bool isOver_ = false;
  std::atomic<bool> hasPassed_ = false;
  std::thread thread_;
};

}  // namespace tavrel
