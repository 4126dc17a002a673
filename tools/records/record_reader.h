// Reads a file of structured records as it grows.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// Yields whole lines, each once. The beginning of a line is read again with its end, because a
/// writer may cut it off first. A file that has lost whole lines is read from its beginning.
class RecordReader {
 public:
  using LineHandler = std::function<void(std::string_view line, std::uint64_t number)>;

  explicit RecordReader(std::string path) : path_(std::move(path)) {}

  /// The lines that were added since the last call. A line of more than
  /// `limits::kStructuredRecordFileBytes` is an error. Lines torn by a kill or a power cut are left
  /// out: those of zero bytes and, when the file `isComplete`, a last one without its end.
  Status read(bool isComplete, const LineHandler& handler);
  /// An error when lines were left out as torn.
  Status wholeness() const;

  const std::string& path() const { return path_; }

 private:
  void leaveOutTornLine();

  std::string path_;
  std::int64_t offset_ = 0;  // of the first line that was not handed out
  std::uint64_t lines_ = 0;
  std::uint64_t tornLines_ = 0;
  std::uint64_t firstTornLine_ = 0;
};

struct StructuredRecord {
  std::string time;
  plist::Value type;
  plist::Dictionary content;
};

/// The record in one line. The error says why there is none.
Expected<StructuredRecord> parseRecord(std::string_view line);

/// A record on one line: "id=4 count=2 stages=[1,2,3]", the last for "stages[0]", "stages[1]" and
/// so on.
std::string recordText(const plist::Dictionary& record);

}  // namespace tavrel
