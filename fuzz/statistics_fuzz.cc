// Statistics buffers of any bytes: the parser must find what a plain walk over the records finds,
// both lists must stay in step, and the NAND information can be built from whatever they hold.
#include <cstdint>
#include <cstring>
#include <memory>
#include <vector>

#include "require.h"
#include "storage/nand_info.h"
#include "storage/nand_info_keys.h"
#include "storage/parse/asp_parser.h"
#include "storage/parse/statistic_keys.h"

namespace {

using namespace tavrel;
using fuzz::require;

struct NoPreferences : Preferences {
  plist::Value ZTXPreferencesGetValue(std::string_view, std::string_view) override { return {}; }
  void ZTXPreferencesSetValue(std::string_view, const plist::Value&, std::string_view) override {}
  bool ZTXPreferencesSynchronize(std::string_view) override { return true; }
};

/// The values that the parser must list for a buffer, and whether the buffer ends properly.
bool walk(ByteSpan buffer, std::vector<std::uint64_t>& values) {
  const std::uint64_t end = buffer.size() / 8 * 8;
  if (end == 0) return false;
  for (std::uint64_t at = 0; at < end;) {
    const std::uint32_t key = *loadLittle32(buffer, at);
    const std::uint64_t count = *loadLittle32(buffer, at + 4);
    if (key > 0x30000000 || at + 8 + 8 * count > end) return false;
    const StatisticKey* const statistic = findStatisticKey(key);
    for (std::uint64_t i = 0; statistic && i < count && i < statistic->cap; ++i)
      values.push_back(*loadLittle64(buffer, at + 8 + 8 * i));
    at += 8 + 8 * count;
  }
  return true;
}

void check(const ASPContext& context, const std::vector<std::uint64_t>& expected) {
  std::vector<std::uint64_t> values;
  const ASPNameEntry* lastName = nullptr;
  for (const ASPNameEntry* name = context.names.head; name; name = name->next)
    lastName = name;
  forEachStatistic(context, [&](std::string_view name, const ASPValueEntry& entry) {
    require(!name.empty() && name.size() <= kLongestASPText);
    require(asText(entry.text) == std::to_string(entry.value));
    values.push_back(entry.value);
  });
  require(values == expected && lastName == context.names.tail);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  // A copy of exactly this size, so that the sanitizer sees a read beyond its end.
  const auto copy = std::make_unique<std::byte[]>(size);
  if (size > 0) std::memcpy(copy.get(), data, size);
  const ByteSpan buffer(copy.get(), size);

  std::vector<std::uint64_t> expected;
  const bool good = walk(buffer, expected);
  ASPContext context;
  require((ASPParseBufferToCxt(context, buffer) == 1) == good);
  require(context.driverVersion == 0xFFFFFFFF && (good || context.exportVersion == 0));
  check(context, expected);

  NoPreferences preferences;
  const auto info = buildNANDInfo(preferences, context, false);
  const auto logged = buildNANDInfo(preferences, context, true);
  require(info.contains(kNANDInfoErrorKey) == (context.exportVersion == 0));
  require(context.exportVersion == 0 ? !logged : logged.size() + 3 == info.size());

  ASPParseBufferToCxt(context, buffer);
  auto twice = expected;
  twice.insert(twice.end(), expected.begin(), expected.end());
  check(context, twice);
  ASPReleaseContext(context);
  check(context, {});
  return 0;
}
