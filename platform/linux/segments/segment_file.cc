#include "platform/linux/segments/segment_file.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <string_view>
#include <unistd.h>

#include "base/utf8.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

// Names reach logs and tables.
bool isValidName(std::string_view name) {
  return std::none_of(name.begin(), name.end(),
                      [](unsigned char c) { return c < ' ' || c == 127; }) &&
         isValidUtf8(name);
}

}  // namespace

void SegmentFile::read(std::uint64_t offset, MutableByteSpan into) const {
  while (!into.empty()) {
    const ssize_t got = pread(descriptor_, into.data(), into.size(), static_cast<off_t>(offset));
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) break;
    offset += static_cast<std::uint64_t>(got);
    into = into.subspan(static_cast<std::size_t>(got));
  }
  std::fill(into.begin(), into.end(), std::byte{0});
  // What is read next was not written earlier.
  std::atomic_thread_fence(std::memory_order_acquire);
}

std::uint32_t SegmentFile::word32(std::uint64_t offset) const {
  std::array<std::byte, 4> bytes;
  read(offset, bytes);
  return *loadLittle32(bytes, 0);
}

std::uint64_t SegmentFile::word64(std::uint64_t offset) const {
  std::array<std::byte, 8> bytes;
  read(offset, bytes);
  return *loadLittle64(bytes, 0);
}

SegmentFacts SegmentFile::facts() const {
  SegmentFacts facts;
  read(kBHHeaderIdentity, facts.identity);
  read(kBHHeaderBoot, facts.boot);
  facts.pidNamespace = word64(kBHHeaderPidNamespace);
  facts.processStart = word64(kBHHeaderStart);
  facts.pid = word32(kBHHeaderPid);
  return facts;
}

SegmentFile::Key SegmentFile::readKey(std::uint32_t number) const {
  Key key;
  const std::uint64_t entry =
      word64(kBHKeyTable + std::uint64_t{number - 1} * std::uint64_t{kBHKeyEntryBytes});
  const std::uint64_t offset = entry & 0xffffffff;
  const std::size_t length = (entry >> 32) & 0xffff;
  if (length == 0 || length > kBHLongestName || offset > kBHNamesBytes ||
      length > kBHNamesBytes - offset) {
    return key;
  }
  key.name.resize(length);
  read(kBHNames + offset, std::as_writable_bytes(std::span(key.name)));
  if (isValidName(key.name)) key.kind = static_cast<std::uint8_t>(entry >> 48);
  return key;
}

const std::string* SegmentFile::key(std::uint32_t number, std::uint8_t kind) {
  if (number == 0 || number > kBHKeys) return nullptr;
  if (keys_.empty()) keys_.resize(kBHKeys + 1);
  Key& key = keys_[number];
  if (!key.isRead) {
    key = readKey(number);
    key.isRead = true;
  }
  return key.kind == kind ? &key.name : nullptr;
}

}  // namespace tavrel
