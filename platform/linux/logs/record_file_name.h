// Names of structured records' files, one per type and UTC day: "<type>-<day>.jsonl".
//
// Each line is one record: {"time":"2026-11-27T18:02:18.250Z","type":172,"record":{...}}.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

inline constexpr std::string_view kRecordFolder =
    "/var/mobile/Library/Logs/CrashReporter/StructuredData";

struct RecordFileName {
  std::uint32_t type;
  std::int64_t day;  // days since 1970-01-01

  bool operator==(const RecordFileName&) const = default;
};

std::string recordFileName(const RecordFileName& file);

/// Nothing for other files.
std::optional<RecordFileName> parseRecordFileName(std::string_view name);

}  // namespace tavrel
