#include "tools/records/record_reader.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"
#include "tools/console/json_value.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"

namespace tavrel {
namespace {

constexpr std::size_t kBlockBytes = 64U << 10;

}  // namespace

Status RecordReader::read(bool isComplete, const LineHandler& handler) {
  // Of a folder's files, few have grown since the last call.
  if (const auto seen = FileSystem::status(path_);
      seen && S_ISREG(seen->st_mode) && seen->st_size == offset_) {
    return Done{};
  }
  const Descriptor file(open(path_.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  struct stat status {};
  if (!file || fstat(file.get(), &status) != 0) return systemError("read", path_);
  if (!S_ISREG(status.st_mode)) return Error{"cannot read " + path_ + ": it is not a regular file"};
  if (status.st_size < offset_) {
    offset_ = 0;
    lines_ = tornLines_ = 0;
  }
  std::string rest;  // the beginning of an unfinished line
  for (;;) {
    const std::size_t kept = rest.size();
    if (kept > limits::kStructuredRecordFileBytes) {
      return Error{
          format("cannot read %s: line %llu is too long; move the file away", path_, lines_ + 1)};
    }
    rest.resize(kept + kBlockBytes);
    const auto unread = offset_ + static_cast<std::int64_t>(kept);
    const ssize_t got = pread(file.get(), rest.data() + kept, kBlockBytes, unread);
    rest.resize(kept + static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return systemError("read", path_);
    if (got == 0) break;

    std::size_t begin = 0;
    std::size_t searched = kept;  // the kept text contains no line end
    for (std::size_t end; (end = rest.find('\n', searched)) != std::string::npos;) {
      const std::string_view line = std::string_view(rest).substr(begin, end - begin);
      if (!line.empty() && line.find_first_not_of('\0') == std::string_view::npos) {
        leaveOutTornLine();
      } else {
        handler(line, ++lines_);
      }
      begin = searched = end + 1;
    }
    offset_ += static_cast<std::int64_t>(begin);
    rest.erase(0, begin);
  }
  if (isComplete && !rest.empty()) {
    offset_ += static_cast<std::int64_t>(rest.size());
    leaveOutTornLine();
  }
  return Done{};
}

void RecordReader::leaveOutTornLine() {
  ++lines_;
  if (tornLines_++ == 0) firstTornLine_ = lines_;
}

Status RecordReader::wholeness() const {
  if (tornLines_ == 0) return Done{};
  return Error{format("%s of %s left out, torn by a kill or a power cut; the first is line %llu",
                      counted(tornLines_, "line"), path_, firstTornLine_)};
}

Expected<StructuredRecord> parseRecord(std::string_view line) {
  const auto value = parseJsonValue(line);
  if (!value) return value.error();
  const plist::Dictionary object = value->dictionary();
  const auto time = object.string("time");
  const auto type = object.number("type");
  const plist::Dictionary content = object.dictionary("record");
  if (!time || !type || !content) {
    return Error{"not an object with \"time\", \"type\" and \"record\""};
  }
  return StructuredRecord{std::string(*time), *type, content};
}

std::string recordText(const plist::Dictionary& record) {
  std::string text;
  std::string list;  // the name of the open list
  std::size_t next = 0;
  const auto closeList = [&] {
    if (!list.empty()) text += ']';
    list.clear();
  };
  for (const plist::Entry& entry : record) {
    const std::string_view key = entry.key;
    if (!list.empty() && key == format("%s[%zu]", list, next)) {
      text += ',';
      ++next;
    } else {
      closeList();
      if (!text.empty()) text += ' ';
      const bool beginsList = key.size() > 3 && key.ends_with("[0]");
      text += beginsList ? key.substr(0, key.size() - 3) : key;
      text += beginsList ? "=[" : "=";
      if (beginsList) list = key.substr(0, key.size() - 3);
      next = 1;
    }
    text += inlineText(entry.value);
  }
  closeList();
  return text;
}

}  // namespace tavrel
