#include "fleet/loading/load.h"

#include <algorithm>
#include <thread>
#include <utility>

#include "base/format.h"
#include "fleet/loading/permitted_keys.h"
#include "fleet/loading/reading_threads.h"
#include "fleet/loading/set_aside.h"
#include "fleet/sources/sources.h"

namespace tavrel::fleet {
namespace {

// The database takes this much in one step. More would hold up other loaders; less costs it time.
// The least is filed at once when no further log has been read yet.
constexpr std::size_t kBatchLogs = 1'000;
constexpr std::size_t kLeastBatchLogs = 256;
constexpr std::size_t kBatchBytes = 64U << 20;

// One thread, the busiest, files what the others read.
unsigned readers() {
  return std::max(2U, std::thread::hardware_concurrency()) - 1;
}

class Loading {
 public:
  Loading(Engine& engine, const LoadRequest& request, const LoadListener& listener)
      : engine_(engine), listener_(listener) {
    if (request.setAside) setAside_.emplace(*request.setAside);
  }

  /// `isMoreRead`: whether another item is available without waiting.
  Status take(ReadItem item, bool isMoreRead) {
    if (item.record) {
      hasMetadata_.push_back(item.source.metadata.has_value());
      batch_.push_back(*std::move(item.record));
      batchBytes_ += item.bytes;
      if (batch_.size() == kBatchLogs || batchBytes_ >= kBatchBytes ||
          (!isMoreRead && batch_.size() >= kLeastBatchLogs)) {
        file();
      }
      return Done{};
    }
    if (item.source.kind == SourceItem::Kind::Other) {
      ++counts_.others;
      return Done{};
    }
    if (item.source.kind == SourceItem::Kind::TooNew) {
      ++counts_.tooNew;
      return Done{};
    }
    const bool isRefused = item.source.kind == SourceItem::Kind::Refused;
    listener_.note(format("%s: %s: %s", isRefused ? "refused" : "skipped", item.source.name,
                          item.source.reason));
    if (!isRefused) return Done{};
    ++counts_.refused;
    return setAside_ ? setAside_->keep(item.source) : Done{};
  }

  LoadCounts finish() {
    file();
    return counts_;
  }

 private:
  void file() {
    if (batch_.empty()) return;
    const Engine::Appended appended = engine_.append(batch_);
    counts_.loaded += appended.added;
    counts_.known += appended.known;
    for (std::size_t i = 0; i < batch_.size(); ++i) {
      if (appended.isNew[i] && !hasMetadata_[i]) ++counts_.withoutMetadata;
    }
    batch_.clear();
    hasMetadata_.clear();
    batchBytes_ = 0;
    listener_.progress(counts_);
  }

  Engine& engine_;
  const LoadListener& listener_;
  std::optional<SetAside> setAside_;
  std::vector<LogRecord> batch_;
  std::vector<bool> hasMetadata_;  // of each record in `batch_`
  std::size_t batchBytes_ = 0;
  LoadCounts counts_;
};

}  // namespace

Expected<LoadCounts> load(Engine& engine, const LoadRequest& request,
                          const LoadListener& listener) {
  PermittedKeys permitted;
  for (const std::string& path : request.whitelists) {
    if (const Status added = permitted.add(path); !added) return added.error();
  }
  UploadLines lines;
  for (const std::string& path : request.uploadLines) {
    const auto useless = lines.read(path);
    if (!useless) return useless.error();
    if (*useless != 0) {
      listener.note(format("%s: %zu %s", path, *useless,
                           *useless == 1 ? "line ignored: it reports no successful upload"
                                         : "lines ignored: they report no successful upload"));
    }
  }
  Loading loading(engine, request, listener);
  ReadingThreads reading(
      [&](const SourceSink& sink) {
        for (const std::string& path : request.paths)
          visitSources(path, lines, sink, request.setAside);
      },
      permitted, readers());
  while (auto item = reading.next()) {
    if (const Status taken = loading.take(*std::move(item), reading.isMoreRead()); !taken)
      return taken.error();
  }
  return loading.finish();
}

}  // namespace tavrel::fleet
