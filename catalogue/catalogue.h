// What figures mean: the statistics that tavrel itself records, live report channels, and the
// statistics of a storage controller.
//
//   if (const Entry* entry = catalogue::findStatistic("com.norvane.usage.processes"))
//     show(entry->meaning, entry->unit);
//
// The rows are those of the tables in docs/catalogue/, which the build turns into constants. A key
// in a row may have placeholders: "<disk>" stands for one or more characters, "<n>" for a number or
// nothing, "*" at the end for anything. Of several rows that fit, the one with the longest text
// before its first placeholder counts, then the one with the most text outside of placeholders.
#pragma once

#include <cstdint>
#include <span>
#include <string_view>

namespace tavrel::catalogue {

enum class Kind : std::uint8_t { Statistic, Channel, Controller };

/// Since when a figure counts.
enum class Since : std::uint8_t {
  Unknown,
  Now,     // a state, when it was read
  Day,     // the day
  Run,     // the previous daily run
  Boot,    // the machine's start
  Attach,  // the kernel's start with the device, mount or group
  Reset,   // whenever somebody sets it back
  Life,    // the making of the device or file system
};

struct Entry {
  std::string_view key;
  std::string_view unit;     // of the table in docs/catalogue/README.md; empty when not known
  std::string_view meaning;  // a sentence without a full stop; empty when not known
  Since since = Since::Unknown;
  std::string_view driver;  // of channels only
  std::string_view group;   // of channels only
};

/// The entry of a statistic's key; null without one.
const Entry* findStatistic(std::string_view key);

/// The entry of a live channel. The driver may carry an id, as in "block <id 0x1f>".
const Entry* findChannel(std::string_view driver, std::string_view group, std::string_view channel);

/// The entry of a controller's statistic, by its name or that of one of its elements.
const Entry* findController(std::string_view name);

/// All entries of a kind, sorted.
std::span<const Entry> entries(Kind kind);

/// As the documents have it: "now", "day", and so on; empty when it is not known.
std::string_view nameOf(Since since);

}  // namespace tavrel::catalogue
