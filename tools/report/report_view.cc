#include "tools/report/report_view.h"

#include <algorithm>
#include <cmath>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "base/format.h"
#include "base/quantity_text.h"
#include "ioreport/elements.h"
#include "ioreport/ioreport.h"
#include "tools/console/table.h"
#include "tools/report/report_quantity.h"
#include "tools/report/report_selection.h"

namespace tavrel {
namespace {

std::string textOr(std::optional<std::string_view> text, std::string_view otherwise) {
  return std::string(text.value_or(otherwise));
}

std::string nameOf(const plist::Dictionary& channel) {
  if (const auto name = IOReportChannelGetChannelName(channel)) return std::string(*name);
  return format("%#llx", IOReportChannelGetChannelID(channel));
}

// "Power state (24Mticks)", or the name alone without a unit.
std::string titleOf(const plist::Dictionary& channel) {
  const std::string label = textOr(IOReportChannelGetUnitLabel(channel), "");
  return label.empty() ? nameOf(channel) : format("%s (%s)", nameOf(channel), label);
}

std::string signedText(std::int64_t value) {
  return value == kInvalidValue ? "-" : std::to_string(value);
}

// A count: unsigned, unless it is a difference.
std::string countText(std::int64_t value, bool isDelta) {
  if (value == kInvalidValue || isDelta) return signedText(value);
  return std::to_string(static_cast<std::uint64_t>(value));
}

// The position of a channel in the tree; detects where another driver, group or subgroup begins.
class Place {
 public:
  explicit Place(const plist::Dictionary& channel)
      : names_{textOr(IOReportChannelGetDriverName(channel), "?"),
               textOr(IOReportChannelGetGroup(channel), ""),
               textOr(IOReportChannelGetSubGroup(channel), "")} {}
  Place() = default;
  bool operator==(const Place&) const = default;

  /// Calls `callback` with the depth and name of each level that differs from `earlier`.
  template <class Callback>
  void forNew(const Place& earlier, const Callback& callback) const {
    bool isNew = false;
    for (std::size_t depth = 0; depth < std::size(names_); ++depth) {
      isNew = isNew || names_[depth] != earlier.names_[depth];
      if (isNew && !names_[depth].empty()) callback(depth, names_[depth]);
    }
  }
  /// How many levels are above the channel.
  std::size_t depth() const {
    if (names_[1].empty()) return 1;
    return names_[2].empty() ? 2 : 3;
  }

 private:
  std::string names_[3];
};

std::vector<Table::Cell> cellsOf(const plist::Dictionary& channel) {
  std::uint64_t type = 0;
  const bool hasType = getChannelType(channel, type) == kKernelSuccess;
  return {formatName(IOReportChannelGetFormat(channel)),
          textOr(IOReportChannelGetUnitLabel(channel), ""),
          format("0x%04x", IOReportChannelGetCategories(channel)),
          hasType ? std::to_string(elementCountOf(type)) : "-",
          format("%#llx", IOReportChannelGetChannelID(channel))};
}

// Prints samples: simple channels as one table per group, the others as blocks of their own.
class SamplePrinter {
 public:
  SamplePrinter(const Page& page, bool isDelta) : page_(page), isDelta_(isDelta) {}

  void print(const plist::Dictionary& channel) {
    Place place(channel);
    if (place != place_) {
      flush();
      place.forNew(place_, [&](std::size_t depth, const std::string& name) {
        if (depth == 0 && place_ != Place()) page_.out << '\n';
        page_.out << std::string(2 * depth, ' ') << page_.styled(printable(name), Emphasis::Strong)
                  << '\n';
      });
      place_ = std::move(place);
    }
    switch (IOReportChannelGetFormat(channel)) {
      case kFormatSimple:
        return addSimple(channel);
      case kFormatState:
        return printStates(channel);
      case kFormatHistogram:
        return printHistogram(channel);
      case kFormatSimpleArray:
        return printArray(channel);
      default:
        simple_.push_back({nameOf(channel), "- (unknown format)"});
    }
  }

  void flush() {
    printTable({{""}, {"", Table::Align::Right}}, std::exchange(simple_, {}), indent());
  }

 private:
  using Rows = std::vector<std::vector<Table::Cell>>;

  void addSimple(const plist::Dictionary& channel) {
    const std::int64_t value = IOReportSimpleGetIntegerValue(channel);
    const auto converted = convertedValue(channel, value);
    const std::string label = textOr(IOReportChannelGetUnitLabel(channel), "");
    std::string text = converted ? textOf(*converted) : signedText(value);
    if (!converted && !label.empty()) text += ' ' + label;
    simple_.push_back({nameOf(channel), std::move(text)});
  }

  std::size_t indent() const { return 2 * place_.depth(); }

  void printTable(std::vector<Table::Column> columns, Rows rows, std::size_t indent) {
    if (rows.empty()) return;
    Table table(std::move(columns), indent);
    for (auto& row : rows)
      table.add(std::move(row));
    table.print(page_);
  }

  void printBlock(const plist::Dictionary& channel, std::vector<Table::Column> columns, Rows rows) {
    flush();
    page_.out << std::string(indent(), ' ') << printable(titleOf(channel));
    page_.out << (rows.empty() ? ": cannot be read\n" : "\n");
    printTable(std::move(columns), std::move(rows), indent() + 2);
  }

  std::string residencyText(const plist::Dictionary& channel, std::int64_t residency) const {
    const auto converted = residency < 0 ? std::nullopt : convertedValue(channel, residency);
    return converted ? textOf(*converted) : countText(residency, isDelta_);
  }

  void printStates(const plist::Dictionary& channel) {
    Rows rows;
    const std::int32_t current = IOReportStateGetCurrent(channel);
    const Elements states = elementsOfType(channel, kFormatState);
    const plist::Array names = stateNames(channel);
    const std::uint64_t total = residencyToShare(states, isDelta_);
    for (std::size_t i = 0; i < states.count(); ++i) {
      const auto name = names.at(i).string();
      const double duty = dutyCycle(states, i, total);
      const std::string entered = countText(states.value(i, kStateInTransitions), isDelta_);
      rows.push_back({name ? std::string(*name) : format("%#llx", states.value(i, kStateID)),
                      std::isnan(duty) ? "-" : percentText(duty), Table::Cell::bar(duty, 1),
                      residencyText(channel, states.value(i, kStateResidency)),
                      "entered " + entered,
                      static_cast<std::int32_t>(i) == current ? "current" : ""});
    }
    printBlock(channel,
               {{""},
                {"", Table::Align::Right},
                {"", Table::Align::Bar},
                {"", Table::Align::Right},
                {"", Table::Align::Right},
                {""}},
               std::move(rows));
  }

  // When one bucket has no bounds, neither do the ones after it.
  static std::string boundsText(const plist::Dictionary& channel, std::int32_t bucket,
                                bool& hasBounds) {
    std::int64_t lower = 0;
    std::int64_t upper = 0;
    hasBounds = hasBounds &&
                IOReportHistogramGetBucketBounds(channel, bucket, &lower, &upper) == kKernelSuccess;
    if (!hasBounds) return "bucket " + std::to_string(bucket);
    return '(' + std::to_string(static_cast<std::uint64_t>(lower)) + ", " +
           std::to_string(static_cast<std::uint64_t>(upper)) + ']';
  }

  void printHistogram(const plist::Dictionary& channel) {
    const std::int32_t count = IOReportHistogramGetBucketCount(channel);
    const Elements buckets = elementsOfType(channel, kFormatHistogram);
    std::uint64_t largest = 0;
    std::vector<std::int64_t> hits;
    for (std::int32_t i = 0; i < count; ++i) {
      hits.push_back(buckets.value(static_cast<std::size_t>(i), kBucketHits));
      if (hits.back() == kInvalidValue) break;
      if (hits.back() > 0) largest = std::max(largest, static_cast<std::uint64_t>(hits.back()));
    }
    Rows rows;
    bool hasBounds = true;
    for (std::int32_t i = 0; i < count && hits.back() != kInvalidValue; ++i) {
      const auto bucket = static_cast<std::size_t>(i);
      const std::int64_t hitsOf = hits[bucket];
      const std::int64_t sum = buckets.value(bucket, kBucketSum);
      std::string spread;
      if (hitsOf > 0 && sum != kInvalidValue) {
        spread =
            format("mean %.1f, %s to %s", static_cast<double>(sum) / static_cast<double>(hitsOf),
                   signedText(buckets.value(bucket, kBucketMinimum)),
                   signedText(buckets.value(bucket, kBucketMaximum)));
      }
      rows.push_back({boundsText(channel, i, hasBounds), countText(hitsOf, isDelta_),
                      Table::Cell::bar(static_cast<double>(hitsOf), static_cast<double>(largest)),
                      std::move(spread)});
    }
    printBlock(channel, {{""}, {"", Table::Align::Right}, {"", Table::Align::Bar}, {""}},
               std::move(rows));
  }

  void printArray(const plist::Dictionary& channel) {
    const Elements elements = elementsOfType(channel, kFormatSimpleArray);
    const std::size_t count = getRawElements(channel, kFormatSimpleArray).count();
    Rows rows;
    for (std::size_t element = 0; element < count; ++element) {
      rows.push_back({'[' + std::to_string(kElementValues * element) + ']'});
      for (std::size_t i = 0; i < kElementValues; ++i)
        rows.back().emplace_back(signedText(elements.value(element, i)));
    }
    constexpr auto kRight = Table::Align::Right;
    printBlock(channel, {{"", kRight}, {"", kRight}, {"", kRight}, {"", kRight}, {"", kRight}},
               std::move(rows));
  }

  const Page& page_;
  const bool isDelta_;
  Place place_;
  Rows simple_;
};

}  // namespace

void printChannels(const Page& page, const plist::Dictionary& channels, bool flat) {
  std::vector<Table::Column> titles{
      {"CHANNEL"}, {"FORMAT"}, {"UNIT"}, {"CATEGORIES"}, {"ELEMENTS", Table::Align::Right}, {"ID"}};
  if (flat) titles.insert(titles.begin(), {{"DRIVER"}, {"GROUP"}, {"SUBGROUP"}});
  Table table(std::move(titles));
  Place last;
  for (const plist::Dictionary& channel : channelsIn(channels)) {
    std::vector<Table::Cell> cells = cellsOf(channel);
    Place place(channel);
    if (flat) {
      cells.insert(cells.begin(),
                   {textOr(IOReportChannelGetDriverName(channel), ""),
                    textOr(IOReportChannelGetGroup(channel), ""),
                    textOr(IOReportChannelGetSubGroup(channel), ""), nameOf(channel)});
    } else {
      place.forNew(last, [&](std::size_t depth, const std::string& name) {
        table.add({std::string(2 * depth, ' ') + name});
      });
      cells.insert(cells.begin(), std::string(2 * place.depth(), ' ') + nameOf(channel));
    }
    table.add(std::move(cells));
    last = std::move(place);
  }
  if (table.empty()) {
    page.out << "no channels\n";
  } else {
    table.print(page);
  }
}

void printSamples(const Page& page, const plist::Dictionary& samples, bool isDelta) {
  SamplePrinter printer(page, isDelta);
  for (const plist::Dictionary& channel : channelsIn(samples))
    printer.print(channel);
  printer.flush();
}

}  // namespace tavrel
