#include "upload/packed_log.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <fcntl.h>
#include <new>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>
#include <zlib.h>

#include "base/base64.h"
#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/system_error.h"

namespace tavrel::upload {
namespace {

constexpr std::size_t kPiece = 64U << 10;
constexpr int kGzip = 16;  // added to the window size to select gzip's format

FileStamp stampFrom(const struct stat& status) {
  return {status.st_dev, status.st_ino, status.st_size, status.st_mtim.tv_sec,
          status.st_mtim.tv_nsec};
}

void end(z_stream* stream) {
  deflateEnd(stream);
  delete stream;
}

}  // namespace

std::optional<FileStamp> stampOf(const std::string& path) {
  struct stat status {};
  if (lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
  return stampFrom(status);
}

Expected<std::optional<ReadLog>> readLog(const std::string& path) {
  const Descriptor file(
      open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY));
  if (!file && errno == ENOENT) return std::optional<ReadLog>();
  if (!file) return systemError("read", path);
  struct stat status {};
  if (fstat(file.get(), &status) != 0) return systemError("read", path);
  if (!S_ISREG(status.st_mode)) return Error{format("cannot read %s: not a regular file", path)};

  ReadLog log{{}, stampFrom(status)};
  log.content.reserve(
      std::min(static_cast<std::size_t>(status.st_size), limits::kPropertyListBytes));
  std::array<char, kPiece> piece;
  while (true) {
    const ssize_t size = read(file.get(), piece.data(), piece.size());
    if (size < 0 && errno == EINTR) continue;
    if (size < 0) return systemError("read", path);
    if (size == 0) return std::optional(std::move(log));
    log.content.append(piece.data(), static_cast<std::size_t>(size));
    if (log.content.size() > limits::kPropertyListBytes) {
      return Error{format("cannot read %s: it has more than %llu bytes", path,
                          std::uint64_t{limits::kPropertyListBytes})};
    }
  }
}

LogPacker::LogPacker() : stream_(new z_stream{}, end) {
  if (deflateInit2(stream_.get(), Z_DEFAULT_COMPRESSION, Z_DEFLATED, MAX_WBITS + kGzip,
                   MAX_MEM_LEVEL - 1, Z_DEFAULT_STRATEGY) != Z_OK) {
    throw std::bad_alloc();
  }
}

PackedLog LogPacker::pack(ByteSpan content, const FileStamp& stamp) {
  PackedLog log{{}, {}, stamp};
  deflateReset(stream_.get());
  // zlib does not write to its input.
  auto* const bytes = const_cast<std::byte*>(content.data());
  stream_->next_in = reinterpret_cast<unsigned char*>(bytes);
  stream_->avail_in = static_cast<unsigned>(content.size());
  std::array<unsigned char, kPiece> piece;
  do {
    stream_->next_out = piece.data();
    stream_->avail_out = piece.size();
    deflate(stream_.get(), Z_FINISH);
    log.content.append(reinterpret_cast<const char*>(piece.data()),
                       piece.size() - stream_->avail_out);
  } while (stream_->avail_out == 0);
  log.digest = "sha-256=:";
  appendBase64(log.digest, sha256(asBytes(log.content)));
  log.digest += ':';
  return log;
}

}  // namespace tavrel::upload
