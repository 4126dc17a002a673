// The meaning of figures: the statistics that tavrel itself records, live report channels, and the
// statistics of a storage controller.
//
//   if (const Entry* entry = catalogue::findStatistic("com.norvane.usage.processes"))
//     show(entry->meaning, entry->unit);
//
// The build makes the rows of the tables in docs/catalogue/. A key in a row may have placeholders:
// "<disk>" stands for one or more characters, "<n>" for a number or nothing, "*" at the end for
// anything. When several rows match, the one with the longest text before its first placeholder
// wins, and among those the one with the most text outside of placeholders.
#pragma once

#include <cstdint>
#include <span>
#include <string_view>

namespace tavrel::catalogue {

enum class Kind : std::uint8_t { Statistic, Channel, Controller };

/// The moment from which a figure counts.
enum class Since : std::uint8_t {
  Unknown,
  Now,     // a state at the time of reading
  Day,     // the day
  Run,     // the previous daily run
  Boot,    // the machine's start
  Attach,  // the kernel's start with the device, mount or group
  Reset,   // the last time somebody reset it
  Life,    // when the device or file system was made
};

struct Entry {
  std::string_view key;
  std::string_view unit;     // from the table in docs/catalogue/README.md; empty when unknown
  std::string_view meaning;  // a sentence without a full stop; empty when unknown
  Since since = Since::Unknown;
  std::string_view driver;  // only for channels
  std::string_view group;   // only for channels
};

/// The entry for a statistic's key; null when there is none.
const Entry* findStatistic(std::string_view key);

/// The unit of a statistic; empty when unknown.
std::string_view unitOf(std::string_view key);

/// The entry for a live channel. The driver may include an id, as in "block <id 0x1f>".
const Entry* findChannel(std::string_view driver, std::string_view group, std::string_view channel);

/// The entry for a controller's statistic, by its name or the name of one of its elements.
const Entry* findController(std::string_view name);

/// All entries of a kind, sorted.
std::span<const Entry> entries(Kind kind);

/// The word that the documents use: "now", "day", and so on; empty when unknown.
std::string_view nameOf(Since since);

}  // namespace tavrel::catalogue
