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
constexpr int kGzip = 16;  // added to the size of the window, selects gzip's form

FileStamp stampFrom(const struct stat& status) {
  return {status.st_dev, status.st_ino, status.st_size, status.st_mtim.tv_sec,
          status.st_mtim.tv_nsec};
}

void end(z_stream* stream) {
  deflateEnd(stream);
  delete stream;
}

// Feeds what is in the stream's input, and the end of the content when there is no more.
void deflateInto(z_stream& stream, int flush, std::string& out) {
  std::array<unsigned char, kPiece> piece;
  do {
    stream.next_out = piece.data();
    stream.avail_out = piece.size();
    deflate(&stream, flush);
    out.append(reinterpret_cast<const char*>(piece.data()), piece.size() - stream.avail_out);
  } while (stream.avail_out == 0);
}

}  // namespace

std::optional<FileStamp> stampOf(const std::string& path) {
  struct stat status {};
  if (lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
  return stampFrom(status);
}

LogPacker::LogPacker() : stream_(new z_stream{}, end) {
  if (deflateInit2(stream_.get(), Z_DEFAULT_COMPRESSION, Z_DEFLATED, MAX_WBITS + kGzip,
                   MAX_MEM_LEVEL - 1, Z_DEFAULT_STRATEGY) != Z_OK) {
    throw std::bad_alloc();
  }
}

Expected<std::optional<PackedLog>> LogPacker::pack(const std::string& path) {
  const Descriptor file(
      open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY));
  if (!file && errno == ENOENT) return std::optional<PackedLog>();
  if (!file) return systemError("read", path);
  struct stat status {};
  if (fstat(file.get(), &status) != 0) return systemError("read", path);
  if (!S_ISREG(status.st_mode)) return Error{format("cannot read %s: not a regular file", path)};

  PackedLog log{{}, {}, stampFrom(status)};
  deflateReset(stream_.get());
  std::array<unsigned char, kPiece> piece;
  std::size_t total = 0;
  while (true) {
    const ssize_t size = read(file.get(), piece.data(), piece.size());
    if (size < 0 && errno == EINTR) continue;
    if (size < 0) return systemError("read", path);
    total += static_cast<std::size_t>(size);
    if (total > limits::kPropertyListBytes) {
      return Error{format("cannot read %s: it has more than %llu bytes", path,
                          std::uint64_t{limits::kPropertyListBytes})};
    }
    stream_->next_in = piece.data();
    stream_->avail_in = static_cast<unsigned>(size);
    deflateInto(*stream_, size == 0 ? Z_FINISH : Z_NO_FLUSH, log.content);
    if (size == 0) break;
  }
  log.digest = "sha-256=:";
  appendBase64(log.digest, sha256(asBytes(log.content)));
  log.digest += ':';
  return std::optional(std::move(log));
}

}  // namespace tavrel::upload
