#include "tools/stat/value_recorder.h"

#include <brimhold/client.h>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <unistd.h>

#include "base/format.h"
#include "client/segment_format.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/folding/recorders.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/platform.h"
#include "tools/stat/import_lines.h"

namespace tavrel {
namespace {

class MemoryRecorder final : public ValueRecorder {
 public:
  MemoryRecorder(std::string folder, Recorders recorders)
      : folder_(std::move(folder)), recorders_(std::move(recorders)) {}

  Status set(ValueTime, const std::string& key, std::int64_t value) override {
    if (Status allowed = checkRights(key); !allowed) return allowed;
    BHClientScalarSet(BHClientScalarForKey(key.c_str()), value);
    return Done{};
  }
  Status add(ValueTime, const std::string& key, std::int64_t amount) override {
    if (Status allowed = checkRights(key); !allowed) return allowed;
    BHClientScalarAdd(BHClientScalarForKey(key.c_str()), amount);
    return Done{};
  }
  Status append(ValueTime, const std::string& key, double value) override {
    if (Status allowed = checkRights(key); !allowed) return allowed;
    BHClientDistributionRecord(BHClientDistributionForKey(key.c_str()), value);
    return Done{};
  }
  Status keep() override {
    switch (BHClientGetStatus(nullptr)) {
      case BHClientStatusRemoved:
        return Error{format(
            "this program's file in %s was removed: what it recorded since then is lost: start it "
            "again",
            folder_)};
      case BHClientStatusFull:
        return Error{
            format("%s is full: values are dropped until 'tavrelctl stat fold' has run", folder_)};
      default:
        return Done{};
    }
  }
  bool isInMemory() const override { return true; }

 private:
  // Otherwise a fold would refuse the value later, when nobody is watching.
  Status checkRights(std::string_view key) const {
    if (user_ == 0 || recorders_.mayRecord(user_, key)) return Done{};
    return Error{
        format("this user may not record %s: run as root, take another key, or name the "
               "user in /etc/tavrel/recorders.plist",
               key)};
  }

  std::string folder_;
  Recorders recorders_;
  uid_t user_ = geteuid();
};

class StoreRecorder final : public ValueRecorder {
 public:
  explicit StoreRecorder(SqliteStore& store) : store_(store) {}

  Status set(ValueTime time, const std::string& key, std::int64_t value) override {
    if (Status begun = begin(); !begun) return begun;
    return keptOpen(batch_->setScalar(time.day, key, value));
  }
  Status add(ValueTime time, const std::string& key, std::int64_t amount) override {
    if (Status begun = begin(); !begun) return begun;
    return keptOpen(batch_->addScalar(time.day, key, amount));
  }
  Status append(ValueTime time, const std::string& key, double value) override {
    if (Status begun = begin(); !begun) return begun;
    return keptOpen(batch_->appendValue(time.day, key, time.secondsInDay, value));
  }
  Status keep() override {
    if (!batch_) return Done{};
    Status done = batch_->commit();
    batch_.reset();
    return done;
  }
  bool isInMemory() const override { return false; }

 private:
  Status begin() {
    if (batch_) return Done{};
    auto batch = store_.beginBatch();
    if (!batch) return batch.error();
    batch_ = std::move(*batch);
    return Done{};
  }
  // A batch that has failed can only be discarded.
  Status keptOpen(Status changed) {
    if (!changed) batch_.reset();
    return changed;
  }

  SqliteStore& store_;
  std::unique_ptr<SqliteBatch> batch_;
};

// The device's recorders, read only when they matter: root may record every key.
Recorders recordersOf(ToolContext& context) {
  const bool isNeeded = geteuid() != 0 && FileSystem::status(context.root().path(kRecordersFile));
  if (!isNeeded) return {};
  FileSystem files;
  Platform& platform = context.platform();
  return Recorders::read(context.root(), files, platform.propertyLists, platform.log);
}

}  // namespace

Expected<std::unique_ptr<ValueRecorder>> openRecorder(ToolContext& context) {
  const std::string root = context.root().path("");
  const std::string folder = context.root().path(kSegmentFolder);
  setenv("TAVREL_ROOT", root.c_str(), 1);
  // The library starts with the first lookup of a key. A key without values leaves no trace.
  BHClientScalarForKey("any");
  switch (BHClientGetStatus(nullptr)) {
    case BHClientStatusNoFolder:
    case BHClientStatusNotInMemory:
      return std::unique_ptr<ValueRecorder>(
          std::make_unique<StoreRecorder>(context.linuxPlatform().store()));
    case BHClientStatusNotAllowed:
      if (access(folder.c_str(), W_OK) != 0 && errno == EROFS) {
        return systemError("create files in", folder);
      }
      return Error{
          format("cannot create files in %s: run as root or join the group brimhold", folder)};
    case BHClientStatusNoSpace:
      return Error{
          format("cannot record in %s: less than an eighth of its tmpfs is free, or a limit of "
                 "this process is exhausted: run 'tavrelctl stat fold' or free space in /run",
                 folder)};
    case BHClientStatusUnsupported:
      return Error{
          format("cannot record in %s: Linux is older than 4.14, or the path is too long or "
                 "relative to a folder that is gone: use 'tavrelctl stat import'",
                 folder)};
    case BHClientStatusFailed:
      return Error{
          format("cannot record in %s: the system failed to create a file: see that it is "
                 "a folder on a tmpfs",
                 folder)};
    default:
      return std::unique_ptr<ValueRecorder>(
          std::make_unique<MemoryRecorder>(folder, recordersOf(context)));
  }
}

ValueTime valueTimeAt(std::chrono::system_clock::time_point time) {
  const auto day = std::chrono::floor<std::chrono::days>(time);
  const auto seconds = std::chrono::floor<std::chrono::seconds>(time - day);
  return {static_cast<std::int32_t>(day.time_since_epoch().count()),
          static_cast<std::uint32_t>(seconds.count())};
}

ValueTime valueTimeNow() {
  return valueTimeAt(std::chrono::system_clock::now());
}

std::string keyFault(const std::string& key) {
  if (key.empty()) return "the key is empty: name a statistic, such as com.example.starts";
  if (key.size() > kBHLongestName) {
    return format("a key of %zu bytes: give at most %d", key.size(), int{kBHLongestName});
  }
  for (const char character : key) {
    if (const auto byte = static_cast<unsigned char>(character); byte >= ' ' && byte != 127)
      continue;
    return format("not a key: %s: give text without control characters", key.substr(0, 60));
  }
  if (!isExportable(key)) return format("not a key: %s: give UTF-8 text", key.substr(0, 60));
  return {};
}

}  // namespace tavrel
