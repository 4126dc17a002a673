#include "fleet/loading/reading_threads.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace tavrel::fleet {
namespace {

constexpr std::size_t kPieceItems = 8;
constexpr std::size_t kPieceBytes = 1U << 20;

// How far the search and the readers may run ahead of the database: in pieces, and in bytes of
// logs, whose records take about as much memory. It is enough to bridge the filing of a batch;
// reusing memory costs less than taking more. The size of a log shows only when it is read, so the
// search and each reader may exceed the bytes by one piece that ends with a log of
// `limits::kLogBytes`: 65 MiB. Besides, each reader keeps the memory of the largest log that it has
// expanded, at most 64 MiB.
constexpr std::size_t kPiecesAhead = 80;
constexpr std::size_t kBytesAhead = 192U << 20;

// A log is read in about the time that it takes to file it, which one thread does, so more readers
// would only wait, and take memory.
constexpr unsigned kMostReaders = 4;

}  // namespace

ReadingThreads::ReadingThreads(std::function<void(const SourceSink&)> find,
                               const PermittedKeys& permitted, unsigned threads)
    : permitted_(permitted) {
  try {
    threads_.emplace_back([this, find = std::move(find)] { search(find); });
    for (unsigned i = 0; i < std::min(threads, kMostReaders); ++i)
      threads_.emplace_back([this] { readPieces(); });
  } catch (...) {
    stop();
    throw;
  }
}

ReadingThreads::~ReadingThreads() {
  stop();
}

void ReadingThreads::stop() {
  {
    const std::lock_guard lock(mutex_);
    stopped_ = true;
    changed_.notify_all();
  }
  for (std::thread& thread : threads_)
    thread.join();
}

void ReadingThreads::noteFailure() {
  const std::lock_guard lock(mutex_);
  if (!failure_) failure_ = std::current_exception();
}

void ReadingThreads::queue(std::shared_ptr<Piece>& piece) {
  if (piece->found.empty()) return;
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [&] {
    return stopped_ || order_.empty() || (order_.size() < kPiecesAhead && bytes_ < kBytesAhead);
  });
  if (stopped_) throw Stopped();
  bytes_ += piece->bytes;
  order_.push_back(piece);
  waiting_.push_back(std::exchange(piece, std::make_shared<Piece>()));
  changed_.notify_all();
}

void ReadingThreads::search(const std::function<void(const SourceSink&)>& find) {
  try {
    auto piece = std::make_shared<Piece>();
    find([&](SourceItem item) {
      piece->bytes += item.content.size();
      piece->found.push_back(std::move(item));
      if (piece->found.size() == kPieceItems || piece->bytes >= kPieceBytes) queue(piece);
    });
    queue(piece);
  } catch (const Stopped&) {
    return;
  } catch (...) {
    noteFailure();
  }
  const std::lock_guard lock(mutex_);
  foundAll_ = true;
  changed_.notify_all();
}

void ReadingThreads::readPieces() {
  LogReader reader;
  while (true) {
    std::shared_ptr<Piece> piece;
    {
      std::unique_lock lock(mutex_);
      // `next` waits for the first piece, so that one is read first, and even beyond the limit.
      const auto first = [&] { return std::ranges::find(waiting_, order_.front()); };
      changed_.wait(lock, [&] {
        if (stopped_ || (foundAll_ && waiting_.empty())) return true;
        if (waiting_.empty()) return false;
        return bytes_ < kBytesAhead || first() != waiting_.end();
      });
      if (stopped_ || waiting_.empty()) return;
      auto chosen = first();
      if (chosen == waiting_.end()) chosen = waiting_.begin();
      piece = std::move(*chosen);
      waiting_.erase(chosen);
    }
    std::size_t bytes = 0;
    try {
      auto item = piece->found.begin();
      for (; item != piece->found.end() && bytes < kPieceBytes; ++item) {
        piece->read.push_back(readItem(std::move(*item), reader, permitted_));
        bytes += piece->read.back().bytes;
      }
      if (item != piece->found.end()) {
        auto rest = std::make_shared<Piece>();
        rest->found.assign(std::move_iterator(item), std::move_iterator(piece->found.end()));
        const std::lock_guard lock(mutex_);
        order_.insert(std::ranges::find(order_, piece) + 1, rest);
        waiting_.push_front(std::move(rest));
      }
    } catch (...) {
      noteFailure();
    }
    piece->found.clear();
    const std::lock_guard lock(mutex_);
    bytes_ += bytes;
    piece->bytes += bytes;
    piece->isRead = true;
    changed_.notify_all();
  }
}

std::optional<ReadItem> ReadingThreads::next() {
  while (!current_ || position_ == current_->read.size()) {
    std::unique_lock lock(mutex_);
    changed_.wait(
        lock, [&] { return failure_ || (order_.empty() ? foundAll_ : order_.front()->isRead); });
    if (failure_) std::rethrow_exception(failure_);
    if (order_.empty()) return std::nullopt;
    current_ = std::move(order_.front());
    order_.pop_front();
    bytes_ -= current_->bytes;
    position_ = 0;
    changed_.notify_all();
  }
  return std::move(current_->read[position_++]);
}

bool ReadingThreads::isMoreRead() {
  if (current_ && position_ < current_->read.size()) return true;
  const std::lock_guard lock(mutex_);
  return order_.empty() ? foundAll_ : order_.front()->isRead;
}

}  // namespace tavrel::fleet
