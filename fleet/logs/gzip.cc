#include "fleet/logs/gzip.h"

#include <algorithm>
#include <memory>
#include <new>
#include <zlib.h>

#include "base/format.h"

namespace tavrel::fleet {
namespace {

constexpr int kGzipOnly = 16;  // a flag that is added to the window size
constexpr std::size_t kFirstRoom = 64U << 10;

struct End {
  void operator()(z_stream* stream) const { inflateEnd(stream); }
};

}  // namespace

bool isGzip(ByteSpan bytes) {
  return asText(bytes).starts_with("\x1F\x8B");
}

Status gunzip(ByteSpan bytes, std::size_t limit, std::string& out) {
  z_stream stream{};
  if (inflateInit2(&stream, MAX_WBITS + kGzipOnly) != Z_OK) throw std::bad_alloc();
  const std::unique_ptr<z_stream, End> owner(&stream);
  // zlib's input pointer is not const, though it changes nothing. A log is far smaller than 4 GiB.
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<std::byte*>(bytes.data()));
  stream.avail_in = static_cast<uInt>(bytes.size());
  std::size_t size = 0;
  out.resize(std::max(out.size(), kFirstRoom));
  while (true) {
    if (size == out.size()) {
      if (size > limit) return Error{format("expands to more than %zu bytes", limit)};
      out.resize(std::min(2 * size, limit + 1));
    }
    stream.next_out = reinterpret_cast<Bytef*>(out.data()) + size;
    stream.avail_out = static_cast<uInt>(out.size() - size);
    const int code = inflate(&stream, Z_NO_FLUSH);
    size = out.size() - stream.avail_out;
    if (code == Z_STREAM_END) {
      if (stream.avail_in == 0) break;
      if (inflateReset(&stream) != Z_OK) throw std::bad_alloc();
    } else if (code == Z_MEM_ERROR) {
      throw std::bad_alloc();
    } else if (code == Z_BUF_ERROR || (code == Z_OK && stream.avail_in == 0 && size < out.size())) {
      return Error{"is cut short: the end of its gzip data is missing"};
    } else if (code != Z_OK) {
      return Error{format("is damaged: its gzip data has %s",
                          stream.msg != nullptr ? stream.msg : "an error")};
    }
  }
  if (size > limit) return Error{format("expands to more than %zu bytes", limit)};
  out.resize(size);
  return Done{};
}

}  // namespace tavrel::fleet
