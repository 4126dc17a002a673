// Reads a file of structured records as it grows.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// Yields whole lines, each once. An unfinished line is read again from its beginning, because a
/// writer may truncate it first. A file that has lost whole lines is read again from the start.
class RecordReader {
 public:
  using LineHandler = std::function<void(std::string_view line, std::uint64_t number)>;

  explicit RecordReader(std::string path) : path_(std::move(path)) {}

  /// Hands out the lines added since the last call. A line of more than
  /// `limits::kStructuredRecordFileBytes` is an error. Lines torn by a kill or a power cut are left
  /// out: lines of zero bytes and, when the file `isComplete`, a last line without its end.
  Status read(bool isComplete, const LineHandler& handler);
  /// An error when torn lines were left out.
  Status wholeness() const;

  const std::string& path() const { return path_; }

 private:
  void leaveOutTornLine();

  std::string path_;
  std::int64_t offset_ = 0;  // of the first line not yet handed out
  std::uint64_t lines_ = 0;
  std::uint64_t tornLines_ = 0;
  std::uint64_t firstTornLine_ = 0;
};

struct StructuredRecord {
  std::string time;
  plist::Value type;
  plist::Dictionary content;
};

/// Parses one line. The error says why it holds no record.
Expected<StructuredRecord> parseRecord(std::string_view line);

/// A record as one line of text: "id=4 count=2 stages=[1,2,3]". Fields such as "stages[0]" and
/// "stages[1]" become one list.
std::string recordText(const plist::Dictionary& record);

}  // namespace tavrel
