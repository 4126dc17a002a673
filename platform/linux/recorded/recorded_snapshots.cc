#include "platform/linux/recorded/recorded_snapshots.h"

#include <string>

#include "base/limits.h"

namespace tavrel {
namespace {

class RecordedSnapshot final : public StackSnapshot {
 public:
  RecordedSnapshot(FileSystem& files, SystemLog& log, std::string path)
      : files_(files), log_(log), path_(std::move(path)) {}

  bool setFlags(std::uint32_t flags) override { return flags == kStackSnapshotKeyCodedData; }

  bool capture() override {
    auto content = files_.readIfPresent(path_, limits::kDeviceAllocationBytes);
    if (!content) log_.write(LogLevel::Error, content.error().message);
    content_ = content ? std::move(*content) : std::nullopt;
    return content_.has_value();
  }

  std::optional<ByteSpan> buffer() override {
    if (!content_) return std::nullopt;
    return asBytes(*content_);
  }

 private:
  FileSystem& files_;
  SystemLog& log_;
  std::string path_;
  std::optional<std::string> content_;
};

}  // namespace

std::unique_ptr<StackSnapshot> RecordedSnapshots::create() {
  return std::make_unique<RecordedSnapshot>(files_, log_, root_.path(kRecordedSnapshot));
}

}  // namespace tavrel
