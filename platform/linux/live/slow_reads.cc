#include "platform/linux/live/slow_reads.h"

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <fcntl.h>
#include <mutex>
#include <new>
#include <system_error>
#include <thread>
#include <utility>

#include "base/format.h"
#include "base/limits.h"

namespace tavrel::live {
namespace {

constexpr std::size_t kAttributeBytes = 4096;

// From `errno`, such as that of a battery bay without a battery.
SlowText failedRead() {
  return {.isGone = errno == ENOENT || errno == ENODEV || errno == ENXIO || errno == ENODATA};
}

SlowText readAll(SlowFile& file) {
  if (!file.descriptor) {
    file.descriptor = Descriptor(open(file.path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY));
  }
  if (!file.descriptor) return failedRead();
  std::string text(kAttributeBytes, '\0');
  const ssize_t count = pread(file.descriptor.get(), text.data(), text.size(), 0);
  if (count < 0) {
    const SlowText failed = failedRead();
    file.descriptor.reset();
    return failed;
  }
  if (!file.staysOpen) file.descriptor.reset();
  text.resize(static_cast<std::size_t>(count));
  return {.text = std::move(text)};
}

// An exception that leaves a thread would end the process.
SlowText readSlowly(SlowFile& file) {
  try {
    return readAll(file);
  } catch (const std::bad_alloc&) {
    return {};
  }
}

}  // namespace

struct SlowReads::Threads {
  std::mutex mutex;  // of all readings
  int count = 0;
};

struct SlowReads::Round {
  std::shared_ptr<Threads> threads;
  std::condition_variable progress;
  std::vector<std::shared_ptr<SlowFile>> files;
  std::vector<SlowText> texts;
  std::vector<bool> isDone;
  std::size_t next = 0;
  std::size_t done = 0;
  bool isOver = false;
};

SlowReads::SlowReads(SystemLog& log, Patience patience)
    : log_(log), patience_(patience), threads_(std::make_shared<Threads>()) {}

void SlowReads::work(const std::shared_ptr<Round>& round) {
  std::unique_lock lock(round->threads->mutex);
  while (!round->isOver && round->next < round->files.size()) {
    const std::size_t index = round->next++;
    const std::shared_ptr<SlowFile> file = round->files[index];
    if (!std::exchange(file->isWaitedFor, true)) {
      lock.unlock();
      auto text = readSlowly(*file);
      lock.lock();
      file->isWaitedFor = false;
      if (round->isOver) break;  // and its texts have been taken
      round->texts[index] = std::move(text);
    }
    round->isDone[index] = true;
    ++round->done;
    round->progress.notify_all();
  }
  // With the lock of the last step, so that the next reading does not count this thread.
  --round->threads->count;
}

std::vector<SlowText> SlowReads::read(std::vector<std::shared_ptr<SlowFile>> files) {
  using Clock = std::chrono::steady_clock;
  const std::size_t count = files.size();
  if (count == 0) return {};
  const auto round = std::make_shared<Round>();
  round->threads = threads_;
  round->files = std::move(files);
  round->texts.resize(count);
  round->isDone.resize(count);
  const std::chrono::milliseconds oneTurn(patience_.oneMilliseconds);
  const auto end = Clock::now() + std::chrono::milliseconds(patience_.allMilliseconds);
  std::unique_lock lock(threads_->mutex);
  while (round->done < count && Clock::now() < end) {
    // Nothing came for a whole turn: the earlier threads wait for sensors, as do those that former
    // readings have left.
    if (round->next == count || threads_->count == limits::kWaitingSensors) break;
    if (!startThread(round)) break;
    std::size_t seen = SIZE_MAX;
    while (seen != round->done && round->done < count) {
      seen = round->done;
      round->progress.wait_until(lock, std::min(end, Clock::now() + oneTurn),
                                 [&] { return round->done != seen; });
    }
  }
  round->isOver = true;
  logMissing(*round);
  return std::move(round->texts);
}

void SlowReads::logMissing(const Round& round) {
  std::size_t unasked = 0;
  const std::string* first = nullptr;
  for (std::size_t i = 0; i < round.files.size(); ++i) {
    if (round.isDone[i]) continue;
    const SlowFile& file = *round.files[i];
    if (i < round.next) {
      log_.log(LogLevel::Default, "%s does not answer within %d ms: left out until it does",
               file.path, patience_.oneMilliseconds);
    } else if (!file.isWaitedFor && unasked++ == 0) {
      first = &file.path;
    }
  }
  if (first == nullptr) return;
  log_.log(LogLevel::Default, "%zu sensors are left out of this reading, the first is %s", unasked,
           *first);
}

bool SlowReads::startThread(const std::shared_ptr<Round>& round) {
  try {
    std::thread([round] { work(round); }).detach();
    ++threads_->count;
    return true;
  } catch (const std::system_error& error) {
    log_.log(LogLevel::Default, "cannot read sensors: no thread: %s", error.what());
    return false;
  }
}

}  // namespace tavrel::live
