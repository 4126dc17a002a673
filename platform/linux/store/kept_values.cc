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

// An entry is this little-endian head, then its key. The file ends with the SHA-256 of all entries.
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
  return *loadLittle32(bytes, 0) | 1U;  // never 0, a new store's application ID
}

KeptContent decode(std::string_view text) {
  std::vector<KeptValue> values;
  if (text.size() < kDigestBytes) return std::nullopt;
  const ByteSpan entries = asBytes(text.substr(0, text.size() - kDigestBytes));
  const auto digest = sha256(entries);
  if (text.substr(entries.size()) != asText(digest)) return std::nullopt;
  for (std::size_t at = 0; at < entries.size();) {
    const auto keySize = loadLittle32(entries, at + kKeySizeAt);
    const auto key = keySize ? slice(entries, at + kHeadBytes, *keySize) : std::nullopt;
    if (!key) return std::nullopt;
    values.push_back({*loadLittle32(entries, at + kNumberAt),
                      static_cast<std::int32_t>(*loadLittle32(entries, at + kDayAt)),
                      static_cast<std::int64_t>(*loadLittle64(entries, at + kValueAt)),
                      std::string(asText(*key))});
    at += bytesOf(values.back());
  }
  return values;
}

}  // namespace

Expected<KeptContent> KeptValues::read() {
  constexpr std::size_t kLargest = limits::kKeptValueBytes + kDigestBytes;
  const auto file = FileSystem::status(path_);
  if (file && S_ISREG(file->st_mode) && file->st_size > static_cast<off_t>(kLargest))
    return KeptContent();
  const auto content = files_.readIfPresent(path_, kLargest);
  if (!content) return content.error();
  if (!*content) return KeptContent(std::in_place);
  return decode(**content);
}

std::string KeptValues::setAsideIfDamaged() {
  if (const auto values = read(); !values || *values) return {};
  const std::string aside = path_ + "-damaged";
  const Status moved = files_.rename(path_, aside);
  return "values kept in " + path_ + " are lost: the file is damaged; " +
         (moved ? "it is now " + aside : moved.error().message);
}

Expected<std::size_t> KeptValues::add(std::vector<KeptValue> values) {
  const std::uint32_t number = newNumber();
  for (KeptValue& value : values)
    value.number = number;
  auto earlier = read();
  if (!earlier) return earlier.error();
  if (!*earlier) return Error{path_ + " is damaged: move it away"};
  values.insert(values.begin(), std::move_iterator((*earlier)->begin()),
                std::move_iterator((*earlier)->end()));
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
