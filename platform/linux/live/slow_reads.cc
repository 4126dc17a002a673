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

std::optional<std::string> readAll(SlowFile& file) {
  if (!file.descriptor) {
    file.descriptor = Descriptor(open(file.path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY));
  }
  if (!file.descriptor) return std::nullopt;
  std::string text(kAttributeBytes, '\0');
  const ssize_t count = pread(file.descriptor.get(), text.data(), text.size(), 0);
  if (count < 0 || !file.staysOpen) file.descriptor.reset();
  if (count < 0) return std::nullopt;
  text.resize(static_cast<std::size_t>(count));
  return text;
}

// An exception that leaves a thread would end the process.
std::optional<std::string> readSlowly(SlowFile& file) try {
  return readAll(file);
} catch (const std::bad_alloc&) {
  return std::nullopt;
}

}  // namespace

struct SlowReads::Round {
  std::shared_ptr<std::mutex> mutex;
  std::condition_variable progress;
  std::vector<std::shared_ptr<SlowFile>> files;
  std::vector<std::optional<std::string>> texts;
  std::vector<bool> isDone;
  std::size_t next = 0;
  std::size_t done = 0;
  bool isOver = false;
};

SlowReads::SlowReads(SystemLog& log, Patience patience)
    : log_(log), patience_(patience), mutex_(std::make_shared<std::mutex>()) {}

void SlowReads::work(const std::shared_ptr<Round>& round) {
  std::unique_lock lock(*round->mutex);
  while (!round->isOver && round->next < round->files.size()) {
    const std::size_t index = round->next++;
    const std::shared_ptr<SlowFile> file = round->files[index];
    if (!std::exchange(file->isWaitedFor, true)) {
      lock.unlock();
      auto text = readSlowly(*file);
      lock.lock();
      file->isWaitedFor = false;
      if (round->isOver) return;  // and its texts have been taken
      round->texts[index] = std::move(text);
    }
    round->isDone[index] = true;
    ++round->done;
    round->progress.notify_all();
  }
}

std::vector<std::optional<std::string>> SlowReads::read(
    std::vector<std::shared_ptr<SlowFile>> files) {
  using Clock = std::chrono::steady_clock;
  const std::size_t count = files.size();
  if (count == 0) return {};
  const auto round = std::make_shared<Round>();
  round->mutex = mutex_;
  round->files = std::move(files);
  round->texts.resize(count);
  round->isDone.resize(count);
  const std::chrono::milliseconds oneTurn(patience_.oneMilliseconds);
  const auto end = Clock::now() + std::chrono::milliseconds(patience_.allMilliseconds);
  int threads = 0;
  std::unique_lock lock(*mutex_);
  while (round->done < count && Clock::now() < end) {
    // Nothing came for a whole turn: the earlier threads wait for sensors.
    if (round->next == count || threads++ == limits::kWaitingSensors) break;
    if (!startThread(round)) break;
    std::size_t seen = SIZE_MAX;
    while (seen != round->done && round->done < count) {
      seen = round->done;
      round->progress.wait_until(lock, std::min(end, Clock::now() + oneTurn),
                                 [&] { return round->done != seen; });
    }
  }
  round->isOver = true;
  for (std::size_t i = 0; i < count; ++i) {
    if (round->isDone[i]) continue;
    if (i < round->next) {
      log_.log(LogLevel::Default, "%s does not answer within %d ms: left out until it does",
               round->files[i]->path, patience_.oneMilliseconds);
    } else {
      log_.log(LogLevel::Default, "%s is left out: the sensors before it took all of the time",
               round->files[i]->path);
    }
  }
  return std::move(round->texts);
}

bool SlowReads::startThread(const std::shared_ptr<Round>& round) {
  try {
    std::thread([round] { work(round); }).detach();
    return true;
  } catch (const std::system_error& error) {
    log_.log(LogLevel::Default, "cannot read sensors: no thread: %s", error.what());
    return false;
  }
}

}  // namespace tavrel::live
