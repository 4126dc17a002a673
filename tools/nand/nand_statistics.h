// Shows a parsed statistics buffer, or the differences between two, to people and programs.
#pragma once

#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "storage/parse/asp_context.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// {"result": …, "fields": {…}, "entries": [[name, value], …]}, with every record of the buffer up
/// to the first broken one. `nand build` turns this into the same bytes.
void printStatisticsJson(std::ostream& out, int result, const ASPContext& context, ByteSpan buffer);

/// One line per statistic, in the order of the buffer. Returns how many records are not listed, or
/// only in part: those of unknown statistics, without values, or with too many.
std::size_t printStatistics(const Page& page, const ASPContext& context, ByteSpan buffer);

/// Why a buffer cannot be parsed: "the record at byte 16: …". Nothing for a valid buffer.
std::optional<std::string> faultOfStatistics(ByteSpan buffer);

/// A statistic whose value differs, or that only one of the two buffers has. The name
/// is borrowed from a context.
struct StatisticDifference {
  std::string_view name;
  std::optional<std::uint64_t> before;
  std::optional<std::uint64_t> after;
};

/// In the order of the first buffer, followed by those that only the second has. When a name occurs
/// several times, the first occurrences are compared, then the second ones, and so on.
std::vector<StatisticDifference> differencesBetween(const ASPContext& before,
                                                    const ASPContext& after);

/// [{"statistic": …, "before": …, "after": …, "change": …}]; missing values, and changes of more
/// than 63 bits, are null.
Json jsonOfDifferences(const std::vector<StatisticDifference>& differences);

void printDifferences(const Page& page, const std::vector<StatisticDifference>& differences);

}  // namespace tavrel
