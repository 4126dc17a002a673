#include "tools/nand/nand_counters.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <ostream>
#include <span>
#include <string>
#include <vector>

#include "base/format.h"
#include "tools/console/table.h"
#include "tools/shared/distribution_view.h"

namespace tavrel {
namespace {

constexpr std::size_t kPerRow = 8;

void printBins(const Page& page, std::span<const std::uint32_t> counters) {
  std::vector<DistributionView::Bucket> bars;
  for (const std::uint32_t counter : counters)
    bars.push_back({std::to_string(bars.size()), counter});
  printBuckets(page, bars);
}

// Prefixes each row with the number of its first element.
void printRows(const Page& page, std::span<const std::uint32_t> counters) {
  Table table(std::vector<Table::Column>(1 + kPerRow, {"", Table::Align::Right}), 2);
  for (std::size_t first = 0; first < counters.size(); first += kPerRow) {
    std::vector<Table::Cell> row{format("%zu:", first)};
    for (std::size_t i = first; i < std::min(first + kPerRow, counters.size()); ++i)
      row.emplace_back(std::to_string(counters[i]));
    table.add(std::move(row));
  }
  table.print(page);
}

}  // namespace

Json jsonOfCounters(std::string_view parser, const TelemetryCounters& counters) {
  Json arrays = Json::object();
  for (const CounterArrayShape& shape : kCounterArrays)
    arrays[std::string(shape.name)] = counters[shape.array];
  return {{"parser", parser}, {"counters", std::move(arrays)}};
}

void printCounters(const Page& page, std::string_view parser, const TelemetryCounters& counters) {
  page.out << "Parser  " << parser << '\n';
  for (const CounterArrayShape& shape : kCounterArrays) {
    const auto array = counters[shape.array];
    const bool isEmpty = std::all_of(array.begin(), array.end(), [](auto c) { return c == 0; });
    page.out << format("\n%s (%zu)%s\n", page.styled(shape.name, Emphasis::Strong), shape.size,
                       isEmpty ? ": all 0" : "");
    if (isEmpty) continue;
    if (shape.name.ends_with("Bin")) {
      printBins(page, array);
    } else {
      printRows(page, array);
    }
  }
}

}  // namespace tavrel
