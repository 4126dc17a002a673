// A log as it is read, and as it travels: compressed, with a digest.
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

/// Tells whether a file is still the one that was read.
struct FileStamp {
  dev_t device;
  ino_t inode;
  off_t size;
  std::int64_t changedSeconds;
  std::int64_t changedNanoseconds;

  bool operator==(const FileStamp&) const = default;
};

/// The stamp of a regular file; nothing for a missing one, or anything else.
std::optional<FileStamp> stampOf(const std::string& path);

struct ReadLog {
  std::string content;
  FileStamp stamp;
};

/// Nothing when there is no such file. Of a log that grows meanwhile, any beginning.
Expected<std::optional<ReadLog>> readLog(const std::string& path);

struct PackedLog {
  std::string content;  // in gzip's form
  std::string digest;   // of `content`, as the header Content-Digest has it (RFC 9530)
  FileStamp stamp;
};

/// Keeps the compressor's memory from log to log.
class LogPacker {
 public:
  LogPacker();

  PackedLog pack(ByteSpan content, const FileStamp& stamp);

 private:
  std::unique_ptr<z_stream_s, void (*)(z_stream_s*)> stream_;
};

}  // namespace tavrel::upload
