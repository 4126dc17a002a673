// The fixed snapshot record, 63 little-endian 32-bit words, and the line that represents it.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "storage/parse/snapshot_field.h"

namespace tavrel {

inline constexpr std::size_t kSnapshotRecordBytes = 252;

namespace snapshot_record {

// A format that does not fit its field does not compile.
consteval SnapshotField field(SnapshotFieldKind kind, std::uint32_t word, std::uint32_t size,
                              std::string_view format) {
  return makeSnapshotField(kind, word * 4, size, format).value();
}
consteval SnapshotField number(std::uint32_t word, std::string_view format) {
  return field(SnapshotFieldKind::Number, word, 0, format);
}
consteval SnapshotField microseconds(std::uint32_t word, std::string_view format) {
  return field(SnapshotFieldKind::Microseconds, word, 0, format);
}
// The triples of priorities 0 to 3.
consteval SnapshotField latencies(std::uint32_t word, std::string_view format) {
  return field(SnapshotFieldKind::Latencies, word, 4 * kLatencyTripleBytes, format);
}

}  // namespace snapshot_record

/// The columns in the order of the line; the first number is the index of the word in the record.
/// Unlisted words are not printed.
inline constexpr std::array kSnapshotRecordFields{
    snapshot_record::number(0, "T=%04u"),
    snapshot_record::number(26, " E=%02u"),
    snapshot_record::number(27, " HR=%4u"),
    snapshot_record::number(28, " HW=%4u"),
    snapshot_record::number(29, " NR=%4u"),
    snapshot_record::number(30, " NW=%4u"),
    snapshot_record::microseconds(39, " TH=%8u.%02u"),
    snapshot_record::number(31, " GC=%4u"),
    snapshot_record::number(33, " W=%2u"),
    snapshot_record::number(36, " BI=%3u"),
    snapshot_record::number(37, " BU=%3u"),
    snapshot_record::number(45, " V=%5u"),
    snapshot_record::number(47, " BF=%2u"),
    snapshot_record::number(48, "/%2u"),
    snapshot_record::number(1, " P=%2u"),
    snapshot_record::number(41, " H=%2u"),
    snapshot_record::number(40, "/%2u"),
    snapshot_record::number(50, " X=%2u"),
    snapshot_record::number(51, "/%2u"),
    snapshot_record::number(43, " L=%3u"),
    snapshot_record::number(44, "/%3u"),
    snapshot_record::number(53, " C=%2u"),
    snapshot_record::number(54, "/%2u"),
    snapshot_record::number(42, " S=%4u"),
    snapshot_record::number(52, " U=%8u"),
    snapshot_record::latencies(14, " R%s="),
    snapshot_record::latencies(2, " W%s="),
};

/// The key of the columns. Readers of these tables rely on every character of it, including the
/// missing line break before "S".
inline constexpr std::string_view kSnapshotColumnKey =
    "Key: \n"
    "T   - Timestamp\n"
    "E   - Erased bands during this time interval\n"
    "HR  - Host Reads (in 4k sectors)\n"
    "HW  - Host Writes (in 4k sectors)\n"
    "NR  - Nand Reads (in 4k sectors)\n"
    "NW  - Nand Writes (in 4k sectors)\n"
    "TH  - Time in Hysteresis in this time interval (in ms)\n"
    "GC  - Number of sectors (4k bytes) completed GC in this time interval\n"
    "W   - Number of wear level bands completed in this time interval\n"
    "BI  - Bands Intermediate (SLC) PendingErase\n"
    "BU  - Bands User (MLC) PendingErase\n"
    "V   - Number of Free Nodes\n"
    "BF  - Buffer Fragments/BufferHighWater\n"
    "P   - Percent of time in DoPreempt rather than DoNormal\n"
    "H   - Qos Delays: Normal/Extreme\n"
    "X   - Successful expedite commands/Failed expedite commands\n"
    "L   - Age of the oldest command in ms (calculated every second)/Qos Interval (in 100us "
    "units)\n"
    "C   - Command tags in use by host (Min/Max)"
    "S   - Number of free segs\n"
    "U   - Sectors of host unmaps\n"
    "RO  - Num read ops for this time interval: priority0/priority1/...\n"
    "RL  - Total Read Latency (in us) for this time interval: priority0/priority1/...\n"
    "RM  - Max Read Latency (int us) for this time interval: priority0/priority1/...\n"
    "WO  - Num write ops for this time interval: priority0/priority1/...\n"
    "WL  - Total write latency (in us) for this time interval: priority0/priority1/...\n"
    "WM  - Max write latency (in us) for this time interval: priority0/priority1/...\n\n";

}  // namespace tavrel
