#include "fleet/sources/archive_source.h"

#include <algorithm>
#include <archive.h>
#include <archive_entry.h>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <new>
#include <system_error>
#include <unordered_map>
#include <utility>

#include "base/format.h"
#include "base/keyed_hash.h"
#include "fleet/logs/limits.h"
#include "fleet/sources/file_name.h"
#include "fleet/sources/limits.h"

namespace tavrel::fleet {
namespace {

using Kind = SourceItem::Kind;

constexpr std::uintmax_t kLargest = std::uintmax_t{1} << 50;

class Archive {
 public:
  explicit Archive(const std::string& path) : archive_(archive_read_new()) {
    if (!archive_) throw std::bad_alloc();
    archive_read_support_format_tar(archive_.get());
    // Archives may follow one another, as `cat` joins them: the first end mark must not hide the
    // rest.
    archive_read_set_format_option(archive_.get(), "tar", "read_concatenated_archives", "1");
    archive_read_support_filter_gzip(archive_.get());
    archive_read_support_filter_bzip2(archive_.get());
    archive_read_support_filter_xz(archive_.get());
    archive_read_support_filter_zstd(archive_.get());
    archive_read_support_filter_lz4(archive_.get());
    archive_read_support_filter_lzip(archive_.get());
    constexpr std::size_t kBlock = 256U << 10;
    std::error_code unknown;
    const std::uintmax_t size = std::filesystem::file_size(path, unknown);
    if (!unknown) {
      most_ = limits::kArchiveFreeBytes +
              limits::kArchiveRatio * static_cast<std::int64_t>(std::min(size, kLargest));
    }
    if (archive_read_open_filename(archive_.get(), path.c_str(), kBlock) != ARCHIVE_OK) note();
  }

  /// The next member; null at the end and after a failure.
  archive_entry* next() {
    if (!failure_.empty()) return nullptr;
    archive_entry* entry = nullptr;
    const int code = archive_read_next_header(archive_.get(), &entry);
    if (code == ARCHIVE_EOF) {
      // A file that stops after a member gives the same code as the end mark, but nothing is read
      // from where the next header should be.
      if (archive_filter_bytes(archive_.get(), 0) == archive_read_header_position(archive_.get())) {
        failure_ = "its end mark is missing: it may be cut short";
      }
      return nullptr;
    }
    if (code != ARCHIVE_OK && code != ARCHIVE_WARN) return note(), nullptr;
    // Count skipped members as well: they are expanded, too.
    const std::int64_t expanded = std::max(archive_filter_bytes(archive_.get(), 0), read_);
    if (expanded > most_ || archive_entry_size(entry) > most_) {
      failure_ = format("expands to more than %lld times its size", limits::kArchiveRatio);
      return nullptr;
    }
    return entry;
  }

  /// Reads the content of the member. False when it exceeds the limit, or after a failure.
  bool read(std::size_t limit, std::string& content) {
    content.clear();
    const void* block = nullptr;
    std::size_t size = 0;
    la_int64_t offset = 0;
    int code = ARCHIVE_OK;
    while ((code = archive_read_data_block(archive_.get(), &block, &size, &offset)) == ARCHIVE_OK) {
      const auto at = static_cast<std::uint64_t>(offset);
      read_ += static_cast<std::int64_t>(at + size - content.size());
      if (at + size > limit) return false;
      // Sparse members have holes, which take no bytes of the archive.
      content.resize(static_cast<std::size_t>(at));
      content.append(static_cast<const char*>(block), size);
    }
    if (code != ARCHIVE_EOF) note();
    return code == ARCHIVE_EOF;
  }

  const std::string& failure() const { return failure_; }

 private:
  void note() {
    const char* const words = archive_error_string(archive_.get());
    failure_ = format("the rest cannot be read: %s", words != nullptr ? words : "it is damaged");
  }

  struct Free {
    void operator()(archive* opened) const { archive_read_free(opened); }
  };
  std::unique_ptr<archive, Free> archive_;
  std::int64_t most_ = 0;  // how many bytes it may expand to
  std::int64_t read_ = 0;  // bytes of contents so far
  std::string failure_;
};

std::string_view nameOf(archive_entry* entry) {
  const char* const name = archive_entry_pathname(entry);
  return name != nullptr ? name : "";
}

bool isFile(archive_entry* entry) {
  return archive_entry_filetype(entry) == AE_IFREG && archive_entry_hardlink(entry) == nullptr;
}

using Sidecars = std::unordered_map<std::string, Expected<LogMetadata>, KeyedHash>;

std::size_t bytesOf(const Sidecars::value_type& sidecar) {
  const auto& [name, metadata] = sidecar;
  const std::size_t bytes = sizeof sidecar + name.size();
  return metadata ? bytes + metadata->logType.size() + metadata->osVersion.size() +
                        metadata->previousOsVersion.size() + metadata->configNumber.size()
                  : bytes + metadata.error().message.size();
}

// `isWhole`: whether the archive could be read to its end.
Expected<Sidecars> readSidecars(const std::string& path, bool& isWhole) {
  Sidecars sidecars;
  std::size_t kept = 0;
  Archive archive(path);
  std::string content;
  while (archive_entry* const entry = archive.next()) {
    const std::string name(nameOf(entry));
    if (!isFile(entry) || !isMetadataName(name)) continue;
    const bool isRead = archive.read(limits::kMetadataBytes, content);
    if (!isRead && !archive.failure().empty()) break;
    const auto [sidecar, isNew] = sidecars.insert_or_assign(
        name, isRead ? readMetadataFile(asBytes(content))
                     : Expected<LogMetadata>(
                           Error{format("has more than %zu bytes", limits::kMetadataBytes)}));
    kept += bytesOf(*sidecar);
    if (kept > limits::kKeptMetadataBytes) {
      return Error{format("its metadata takes more than %zu bytes: divide it into smaller archives",
                          limits::kKeptMetadataBytes)};
    }
  }
  isWhole = archive.failure().empty();
  return sidecars;
}

Expected<std::optional<LogMetadata>> metadataOf(const std::string& name, const Sidecars& sidecars,
                                                const UploadLines& lines) {
  const auto sidecar = sidecars.find(sidecarOf(name));
  if (sidecar != sidecars.end()) {
    if (!sidecar->second) return sidecar->second.error();
    return std::optional(*sidecar->second);
  }
  const LogMetadata* const line = lines.find(folderNameOf(name), withoutGzip(fileNameOf(name)));
  return line != nullptr ? std::optional(*line) : std::nullopt;
}

}  // namespace

void visitArchive(const std::string& path, const UploadLines& lines, const SourceSink& sink) {
  const auto refuse = [&](const std::string& reason) {
    SourceItem item;
    item.kind = Kind::Refused;
    item.name = path;
    item.reason = reason;
    sink(std::move(item));
  };
  bool isWhole = false;
  const Expected<Sidecars> sidecars = readSidecars(path, isWhole);
  if (!sidecars) return refuse(sidecars.error().message);
  Archive archive(path);
  while (archive_entry* const entry = archive.next()) {
    const std::string name(nameOf(entry));
    if (archive_entry_filetype(entry) == AE_IFDIR || !isLogName(fileNameOf(name))) continue;
    SourceItem item;
    item.name = format("%s: %s", path, name);
    if (!isFile(entry)) {
      item.kind = Kind::Skipped;
      item.reason = "is not a regular file";
      sink(std::move(item));
      continue;
    }
    const auto metadata = metadataOf(name, *sidecars, lines);
    if (metadata) item.metadata = *metadata;
    if (isOtherLog(withoutGzip(fileNameOf(name)), item.metadata ? &*item.metadata : nullptr)) {
      item.kind = Kind::Other;
    } else if (archive.read(limits::kLogBytes, item.content)) {
      item.kind = Kind::Refused;
      if (!metadata) {
        item.reason = "its metadata: " + metadata.error().message;
      } else if (!isWhole && !item.metadata) {
        item.reason = "its metadata may be in the rest of the archive";
      } else {
        item.kind = Kind::Content;
      }
    } else if (archive.failure().empty()) {
      item.kind = Kind::Refused;
      item.content.clear();
      item.reason = format("has more than %zu bytes", limits::kLogBytes);
    } else {
      break;
    }
    sink(std::move(item));
  }
  if (!archive.failure().empty()) refuse(archive.failure());
}

}  // namespace tavrel::fleet
