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

// Values instead of a key's kind: not read yet, and no valid key.
constexpr std::uint8_t kUnread = 0xff;
constexpr std::uint8_t kNoKind = 0;

// Names appear in logs and tables, so control characters are refused.
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
    if (got < 0) error_ = errno;
    if (got <= 0) break;
    offset += static_cast<std::uint64_t>(got);
    into = into.subspan(static_cast<std::size_t>(got));
  }
  std::fill(into.begin(), into.end(), std::byte{0});
  // Later reads must not return data older than this one.
  std::atomic_thread_fence(std::memory_order_acquire);
}

std::uint32_t SegmentFile::word32(std::uint64_t offset) const {
  std::array<std::byte, 4> bytes;
  read(offset, bytes);
  return *loadNative32(bytes, 0);
}

std::uint64_t SegmentFile::word64(std::uint64_t offset) const {
  std::array<std::byte, 8> bytes;
  read(offset, bytes);
  return *loadNative64(bytes, 0);
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

// Also reads the neighbouring keys, whose names are adjacent.
void SegmentFile::readKeys(std::uint32_t number) {
  constexpr std::uint32_t kAtOnce = 64;
  const std::uint32_t first = (number - 1) / kAtOnce * kAtOnce;
  std::array<std::byte, std::size_t{kAtOnce} * kBHKeyEntryBytes> entries;
  read(kBHKeyTable + std::uint64_t{first} * std::uint64_t{kBHKeyEntryBytes}, entries);
  // A name is written before its entry, so it is complete once the entry has been read.
  std::array<std::byte, 8192> names;
  std::size_t namesStart = 0;
  std::size_t namesEnd = 0;
  for (std::uint32_t i = 0; i < kAtOnce; ++i) {
    std::uint8_t& keptKind = kinds_[first + i + 1];
    std::string& name = names_[first + i + 1];
    if (keptKind != kUnread) continue;
    const std::uint64_t entry =
        *loadNative64(entries, std::size_t{i} * std::size_t{kBHKeyEntryBytes});
    const std::size_t offset = entry & 0xffffffff;
    const std::size_t length = (entry >> 32) & 0xffff;
    if (length == 0 || length > kBHLongestName || offset > kBHNamesBytes ||
        length > kBHNamesBytes - offset) {
      continue;
    }
    if (offset < namesStart || offset + length > namesEnd) {
      const std::size_t size = std::min(names.size(), std::size_t{kBHNamesBytes} - offset);
      read(kBHNames + offset, MutableByteSpan(names).first(size));
      namesStart = offset;
      namesEnd = offset + size;
    }
    name = asText(ByteSpan(names).subspan(offset - namesStart, length));
    const auto kind = static_cast<std::uint8_t>(entry >> 48);
    keptKind = isValidName(name) && kind != kUnread ? kind : kNoKind;
  }
  if (kinds_[number] == kUnread) kinds_[number] = kNoKind;
}

const std::string* SegmentFile::readKey(std::uint32_t number, std::uint8_t kind) {
  if (number == 0 || number > kBHKeys) return nullptr;
  if (kinds_.empty()) {
    kinds_.assign(kBHKeys + 1, kUnread);
    names_.resize(kBHKeys + 1);
  }
  if (kinds_[number] == kUnread) readKeys(number);
  return kinds_[number] == kind ? &names_[number] : nullptr;
}

}  // namespace tavrel
