// Reads logs in several threads and hands them out in the order in which they were found.
//
//   ReadingThreads reading(find, permitted, 2);
//   while (auto item = reading.next()) ...
#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <exception>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <thread>
#include <vector>

#include "fleet/loading/read_item.h"

namespace tavrel::fleet {

class ReadingThreads {
 public:
  /// `find` runs in a thread of its own and passes what it finds to the sink. `next`
  /// rethrows what `find` throws. No more than four threads read, however many are asked for.
  ReadingThreads(std::function<void(const SourceSink&)> find, const PermittedKeys& permitted,
                 unsigned threads);
  ReadingThreads(const ReadingThreads&) = delete;
  ReadingThreads& operator=(const ReadingThreads&) = delete;
  /// Stops the search.
  ~ReadingThreads();

  /// Nothing once all items have been taken.
  std::optional<ReadItem> next();
  /// Whether `next` would not wait.
  bool isMoreRead();

 private:
  struct Stopped {};
  // Items that one thread reads in a row, which makes the threads wait for each other less often.
  // A piece ends after a large one, which shows only when it is read; the rest becomes another.
  struct Piece {
    std::vector<SourceItem> found;
    std::vector<ReadItem> read;
    std::size_t bytes = 0;
    bool isRead = false;
  };

  void search(const std::function<void(const SourceSink&)>& find);
  void queue(std::shared_ptr<Piece>& piece);
  void readPieces();
  void noteFailure();
  void stop();

  const PermittedKeys& permitted_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::shared_ptr<Piece>> order_;    // everything that `next` has not taken
  std::deque<std::shared_ptr<Piece>> waiting_;  // the part of it that no thread reads yet
  std::size_t bytes_ = 0;                       // of everything in `order_`
  bool foundAll_ = false;
  bool stopped_ = false;
  std::exception_ptr failure_;

  std::shared_ptr<Piece> current_;  // what `next` hands out
  std::size_t position_ = 0;

  std::vector<std::thread> threads_;
};

}  // namespace tavrel::fleet
