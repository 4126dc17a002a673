// A log as read from its file, and as sent: compressed, with a digest.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <sys/types.h>

#include "base/bytes.h"
#include "base/expected.h"

struct z_stream_s;

namespace tavrel::upload {

/// Identifies the state of a file, to detect whether it has changed since it was read.
struct FileStamp {
  dev_t device;
  ino_t inode;
  off_t size;
  std::int64_t changedSeconds;
  std::int64_t changedNanoseconds;

  bool operator==(const FileStamp&) const = default;
};

/// The stamp of a regular file; nothing when it is missing or anything else.
std::optional<FileStamp> stampOf(const std::string& path);

struct ReadLog {
  std::string content;
  FileStamp stamp;
};

/// Nothing when there is no such file. A log that grows meanwhile yields some beginning of it.
Expected<std::optional<ReadLog>> readLog(const std::string& path);

struct PackedLog {
  std::string content;  // compressed with gzip
  std::string digest;   // of `content`, in the format of the Content-Digest header (RFC 9530)
  FileStamp stamp;
};

/// Compresses logs, reusing its memory from one to the next.
class LogPacker {
 public:
  LogPacker();

  PackedLog pack(ByteSpan content, const FileStamp& stamp);

 private:
  std::unique_ptr<z_stream_s, void (*)(z_stream_s*)> stream_;
};

}  // namespace tavrel::upload
