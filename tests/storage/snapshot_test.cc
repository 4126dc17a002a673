#include <gtest/gtest.h>
#include <limits>
#include <string>
#include <vector>

#include "base/format.h"
#include "recorded_driver.h"
#include "storage/parse/snapshot_descriptor.h"
#include "storage/parse/snapshot_record.h"
#include "storage/parse/snapshot_text.h"

namespace tavrel {
namespace {

constexpr std::uint32_t kMost = std::numeric_limits<std::uint32_t>::max();

std::string words(std::initializer_list<std::uint32_t> list) {
  return std::string(asText(fakes::words(list)));
}

struct Field {
  std::uint32_t kind, offset, size;
  const char* format;
};

// Parts that are not read are all ones. The table is after the key, or at `table` if given.
std::string descriptor(std::uint32_t version, std::uint32_t stride, std::uint32_t count,
                       const std::vector<Field>& fields, std::string key = {},
                       std::uint32_t table = 0) {
  key.push_back('\0');
  if (table == 0) table = static_cast<std::uint32_t>(32 + key.size());
  std::string text = words({kMost, version, stride, count, kMost, kMost, table, kMost}) + key;
  text += words({static_cast<std::uint32_t>(fields.size()), kMost});
  for (const Field& field : fields) {
    std::string format = field.format;
    format.resize(16);
    text += words({field.kind | 0xABCD0000, field.offset, field.size}) + format;
  }
  return text;
}

// The text; nothing when the result is 0.
std::string render(std::string_view records, const std::string* by = nullptr) {
  std::string text(1 << 14, '#');
  std::size_t length = text.size();
  const int answer =
      by ? ASPParseSnapshotBufferWithInplaceParser(asBytes(records), text, length, asBytes(*by))
         : ASPParseSnapshotBuffer(asBytes(records), text, length);
  return text.substr(0, answer == 1 ? length : 0);
}

// Every word holds its own number, except the first and the time in hysteresis.
std::string record(std::uint32_t timestamp) {
  std::string text = words({timestamp});
  for (std::uint32_t word = 1; word < 63; ++word)
    text += words({word == 39 ? 123456 : word});
  return text;
}

const std::string kKey(kSnapshotColumnKey);
const std::string kLine =
    "T=0007 E=26 HR=  27 HW=  28 NR=  29 NW=  30 TH=     123.45 GC=  31 W=33 BI= 36 BU= 37 "
    "V=   45 BF=47/48 P= 1 H=41/40 X=50/51 L= 43/ 44 C=53/54 S=  42 U=      52 "
    "RO=  14/  17/  20/  23 RL=     15/     18/     21/     24 RM=   16/   19/   22/   25 "
    "WO=   2/   5/   8/  11 WL=      3/      6/      9/     12 WM=    4/    7/   10/   13\n";

TEST(Snapshot, RendersWholeRecordsOfTheFixedLayoutAndLikeOnesByDescriptor) {
  EXPECT_EQ(fingerprint(kKey), 0xB502D424D3993697U);
  const std::string records = record(0) + record(7) + record(7);
  EXPECT_EQ(render(records.substr(0, 251)), kKey + "\n");
  EXPECT_EQ(render(records.substr(252, 500)), kKey + kLine + "\n");
  EXPECT_EQ(render(records.substr(0, 600)), kKey + "T=0000" + kLine.substr(6) + kLine + "\n");

  std::vector<Field> fields;
  fields.reserve(std::size(kSnapshotRecordFields));
  for (const SnapshotField& field : kSnapshotRecordFields) {
    fields.push_back({static_cast<std::uint32_t>(field.kind) + 1, field.offset, field.triples * 12,
                      field.format.data()});
  }
  const std::string like = descriptor(5, 252, 3, fields);
  EXPECT_EQ(render(records, &like), kKey + kLine + kLine);
}

TEST(Snapshot, CutsWhatDoesNotFit) {
  const std::string whole = kKey + kLine + "\n";
  for (std::size_t capacity = 0; capacity <= whole.size() + 1; ++capacity) {
    const bool fits = capacity > whole.size();
    std::string text(whole.size() + 8, '#');
    std::string expected = text;
    if (capacity > 0) expected.replace(0, capacity, whole.substr(0, capacity - 1) + '\0');
    std::size_t length = capacity;
    EXPECT_EQ(ASPParseSnapshotBuffer(asBytes(record(7)), text, length), fits ? 1 : 0);
    EXPECT_EQ(length, fits ? whole.size() : capacity);
    EXPECT_EQ(text, expected) << capacity;
  }
}

TEST(Snapshot, PrintsFieldsByKindAndLeavesUnusedRecordsOut) {
  const std::string records = words({9, 123999, kMost, 4, 5, 6, 7, 0, 1, 2, 3, 4, 5, 6});
  const std::pair<std::vector<Field>, const char*> cases[] = {
      {{{0, 0, 0, "%u"}, {1, 8, 0, " %d"}}, "9 -1\n"},
      {{{1, 0, 0, ""}, {2, 0, 0, ""}, {3, 4, 12, ""}}, "1239994294967295    4\n"},
      {{{4, 0, 0, "%n"}, {9, kMost, kMost, "no zero byte, none"}, {1, 12, 0, "%x"}}, "4\n"},
      {{{2, 0, 0, "%u.%02u"}, {2, 8, 0, " %u.%02u"}}, "0.00 4294967.29\n"},
      {{{2, 0, 0, "%u"}, {1, 0, 0, "|"}, {0, 0, 0, "100%%"}}, "0|100%\n"},
      {{{3, 0, 35, "%s:"}}, "O:   9/   4L: 123999/      5M:4294967295/    6\n"},
      {{{3, 0, 8, "%s "}, {0, 0, 0, "%c"}}, "O L M \t\n"}};
  for (const auto& [fields, text] : cases) {
    const std::string by = descriptor(6, 28, 2, fields, "%s%n ");
    EXPECT_EQ(render(records, &by), std::string("%s%n ") + text);
  }

  // Records that overlap, coincide, or end before the part that is not read.
  const std::tuple<std::uint32_t, std::uint32_t, std::vector<Field>, const char*> placed[] = {
      {4, 3, {{0, 0, 0, "%u "}, {0, 4, 0, "%u"}}, "1 2\n2 0\n"},
      {0, 2, {{0, 4, 0, "%u"}}, "2\n2\n"},
      {0, kMost, {{0, 8, 0, "%u"}}, ""},
      {256,
       1,
       {{0, 0, 0, "%u"}, {1, 999, 0, ""}, {3, kMost, 11, "%s"}, {4, kMost, 0, ""}},
       "1OLM\n"}};
  for (const auto& [stride, count, fields, text] : placed) {
    const std::string by = descriptor(6, stride, count, fields, "");
    EXPECT_EQ(render(words({1, 2, 0, 3}), &by), text);
  }
}

TEST(Snapshot, RefusesDescriptorsThatBreakALimit) {
  const auto of = [](std::uint32_t kind, std::uint32_t offset, std::uint32_t size, auto* format) {
    return descriptor(6, 12, 2, {{9, 0, 0, ""}, {kind, offset, size, format}});
  };
  const auto asks = [](std::string_view text, int kind) {
    return format("the format \"%s\" of field 1 asks for what kind %d does not give", text, kind);
  };
  const auto beyond = [](int field, std::uint32_t count, std::uint64_t end) {
    return format("field %d of the last of %u records ends at byte %llu of a buffer of 24", field,
                  count, end);
  };
  const std::vector<Field> one{{1, 0, 0, "%u"}};
  const std::pair<std::string, std::string> cases[] = {
      {of(1, 8, 0, "%4096u"), ""},
      {of(3, 0, 23, "O"), ""},
      {descriptor(kMost, 28, 0, {}, "no field, no record"), ""},
      {of(1, 9, 0, "%u"), beyond(1, 2, 25)},
      {of(2, kMost, 0, "%u"), beyond(1, 2, 12 + 4294967299)},
      {of(3, 1, 12, ""), beyond(1, 2, 25)},
      {of(3, kMost, kMost, ""), beyond(1, 2, 12 + 8589934587)},
      {of(1, 0, 0, "sixteen bytes: %"), "the format of field 1 has no zero byte"},
      {of(1, 0, 0, "%99999999u"), asks("%99999999u", 1)},
      {of(1, 0, 0, "%n"), asks("%n", 1)},
      {of(1, 0, 0, "%s"), asks("%s", 1)},
      {of(1, 0, 0, "%u%u"), asks("%u%u", 1)},
      {of(1, 0, 0, "100 %"), asks("100 %", 1)},
      {of(2, 0, 0, "%*d"), asks("%*d", 2)},
      {of(3, 0, 0, "%u"), asks("%u", 3)},
      {descriptor(6, 4, 1, {{5, 21, 0, ""}}), beyond(0, 1, 25)},
      {descriptor(6, 10, 4, one), beyond(0, 4, 34)},
      {descriptor(6, kMost, kMost, one), beyond(0, kMost, 18446744060824649734U)},
      {descriptor(6, 4, 1, {}), "there are records but no fields"},
      {descriptor(5, 4, 1, one, "", 34),
       "the field table at byte 34 ends beyond the descriptor's 69 bytes"},
      {descriptor(6, 4, 1, one).substr(0, 32), "the key has no zero byte"},
      {std::string(27, '\0'), "the descriptor ends within its header, at 27 bytes"}};
  const std::string records(24, 'r');
  for (const auto& [bytes, reason] : cases) {
    const auto layout = readSnapshotDescriptor(asBytes(bytes), records.size());
    EXPECT_EQ(layout ? "" : layout.error().message, reason);
    EXPECT_EQ(render(records, &bytes).empty(), !layout) << reason;
  }
}

}  // namespace
}  // namespace tavrel
