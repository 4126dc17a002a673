#include "platform/linux/store/kept_values.h"

#include <array>
#include <iterator>
#include <string_view>
#include <utility>

#include "base/bytes.h"
#include "base/limits.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/random.h"

namespace tavrel {
namespace {

// An entry is this head, little-endian, and its key. The file ends with the SHA-256 of all entries.
constexpr std::size_t kNumberAt = 0;
constexpr std::size_t kDayAt = 4;
constexpr std::size_t kValueAt = 8;
constexpr std::size_t kKeySizeAt = 16;
constexpr std::size_t kHeadBytes = 20;
constexpr std::size_t kDigestBytes = 32;

std::size_t bytesOf(const KeptValue& value) {
  return kHeadBytes + value.key.size();
}

void append(std::string& out, const KeptValue& value) {
  std::array<std::byte, kHeadBytes> head{};
  storeLittle32(head, kNumberAt, value.number);
  storeLittle32(head, kDayAt, static_cast<std::uint32_t>(value.day));
  storeLittle64(head, kValueAt, static_cast<std::uint64_t>(value.value));
  storeLittle32(head, kKeySizeAt, static_cast<std::uint32_t>(value.key.size()));
  out += asText(head);
  out += value.key;
}

std::uint32_t newNumber() {
  std::array<std::byte, 4> bytes{};
  fillRandom(bytes);
  return *loadLittle32(bytes, 0) | 1U;  // never 0, the id of a new store
}

}  // namespace

Expected<std::vector<KeptValue>> KeptValues::read() {
  const auto content = files_.readIfPresent(path_, limits::kKeptValueBytes + kDigestBytes);
  if (!content) return content.error();
  std::vector<KeptValue> values;
  if (!*content) return values;
  const auto damaged = [this] {
    return Error{"values kept in " + path_ + " are lost: the file is damaged; remove it"};
  };
  const std::string_view text = **content;
  if (text.size() < kDigestBytes) return damaged();
  const ByteSpan entries = asBytes(text.substr(0, text.size() - kDigestBytes));
  const auto digest = sha256(entries);
  if (text.substr(entries.size()) != asText(digest)) return damaged();
  for (std::size_t at = 0; at < entries.size();) {
    const auto keySize = loadLittle32(entries, at + kKeySizeAt);
    const auto key = keySize ? slice(entries, at + kHeadBytes, *keySize) : std::nullopt;
    if (!key) return damaged();
    values.push_back({*loadLittle32(entries, at + kNumberAt),
                      static_cast<std::int32_t>(*loadLittle32(entries, at + kDayAt)),
                      static_cast<std::int64_t>(*loadLittle64(entries, at + kValueAt)),
                      std::string(asText(*key))});
    at += bytesOf(values.back());
  }
  return values;
}

Expected<std::size_t> KeptValues::add(std::vector<KeptValue> values) {
  const std::uint32_t number = newNumber();
  for (KeptValue& value : values)
    value.number = number;
  if (auto earlier = read()) {
    values.insert(values.begin(), std::move_iterator(earlier->begin()),
                  std::move_iterator(earlier->end()));
  }
  std::size_t bytes = 0;
  std::size_t first = values.size();
  while (first > 0 && bytes + bytesOf(values[first - 1]) <= limits::kKeptValueBytes)
    bytes += bytesOf(values[--first]);
  std::string content;
  content.reserve(bytes + kDigestBytes);
  for (std::size_t i = first; i < values.size(); ++i)
    append(content, values[i]);
  content += asText(sha256(asBytes(content)));
  if (Status written = files_.replace(path_, asBytes(content), 0640); !written) {
    return written.error();
  }
  return first;
}

}  // namespace tavrel
