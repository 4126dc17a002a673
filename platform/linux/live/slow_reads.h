// Reads files of devices that may keep the reader waiting.
//
// A thread reads them one after another. When a file does not answer in time, another thread goes
// on with the rest, and the reading ends without that file. A later reading leaves it out for as
// long as the first thread still waits. While `limits::kWaitingSensors` threads wait, no other
// starts, and readings have no files.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/linux/live/kernel_file.h"
#include "platform/system_log.h"

namespace tavrel::live {

/// A file that only one thread at a time reads. It outlives its owner while a thread waits for it.
struct SlowFile {
  SlowFile(std::string filePath, bool mayStayOpen)
      : path(std::move(filePath)), staysOpen(mayStayOpen) {}

  const std::string path;
  const bool staysOpen;
  Descriptor descriptor = {};
  bool isWaitedFor = false;  // guarded by the mutex of all readings
};

/// What came of reading such a file.
struct SlowText {
  std::optional<std::string> text = {};
  bool isGone = false;  // there is no device, or it has no such figure, rather than no answer
};

struct Patience {
  int oneMilliseconds;
  int allMilliseconds;
};

class SlowReads {
 public:
  SlowReads(SystemLog& log, Patience patience);

  /// The texts of all files, in their order; none for those that failed or did not answer. A log
  /// line names those that did not answer.
  std::vector<SlowText> read(std::vector<std::shared_ptr<SlowFile>> files);

 private:
  struct Threads;
  struct Round;
  static void work(const std::shared_ptr<Round>& round);
  bool startThread(const std::shared_ptr<Round>& round);
  void logMissing(const Round& round);

  SystemLog& log_;
  const Patience patience_;
  // Shared by all readings: a file may still belong to a thread of an earlier one.
  const std::shared_ptr<Threads> threads_;
};

}  // namespace tavrel::live
