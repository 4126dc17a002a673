// The health of drives, from the readings that tavrel-health stores. Sends no command to a drive.

#include <algorithm>
#include <array>
#include <ctime>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "platform/linux/files/boot_id.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/health/drives.h"
#include "platform/linux/health/reading.h"
#include "platform/linux/health/verdict.h"
#include "platform/linux/live/kernel_text.h"
#include "platform/linux/live/sources.h"

namespace tavrel::live {
namespace {

// Figures worth a scalar a day: the states of a drive, and of counters only the growth.
constexpr auto kDailyFigures = std::to_array<std::string_view>({
    "bad_blocks",
    "bad_sectors",
    "bad_user_blocks_growth",
    "capacitor_pct",
    "corrected_bits_growth",
    "crc_errors_growth",
    "critical_warning",
    "ecc_failures_growth",
    "erases_max",
    "failing_attributes",
    "life_a_pct",
    "life_b_pct",
    "media_errors_growth",
    "media_written_growth",
    "pre_eol",
    "read_growth",
    "reallocated_sectors_growth",
    "smart_good",
    "spare_pct",
    "uncorrectable_reads_growth",
    "unsafe_shutdowns_growth",
    "used_pct",
    "waf_milli",
    "written_growth",
});
static_assert(std::ranges::is_sorted(kDailyFigures));

// Figures of the readings that are still valid.
std::vector<health::NamedFigure> figuresNow(const DeviceRoot& root) {
  FileSystem files;
  std::vector<health::Reading> readings = health::loadReadings(root, files).readings;
  const std::string boot = bootIDOf(root);
  const std::int64_t now = std::time(nullptr);
  std::erase_if(readings, [&](const health::Reading& reading) {
    constexpr auto kUnusable = health::kUnread | health::kOld;
    return reading.boot != boot || (health::judge(reading, now, boot).problems & kUnusable) != 0;
  });
  return health::figuresOf(readings);
}

}  // namespace

void addHealth(const DeviceRoot& root, LiveSource& source) {
  const std::vector<health::NamedFigure> figures = figuresNow(root);
  if (figures.empty()) return;
  std::vector<std::string> names;
  names.reserve(figures.size());
  for (const health::NamedFigure& figure : figures)
    names.push_back(figure.name);
  const std::uint32_t first =
      source.addMeasured(static_cast<std::uint32_t>(figures.size()),
                         [&root, names = std::move(names)](std::span<std::int64_t> slots) {
                           std::unordered_map<std::string, std::int64_t> values;
                           for (health::NamedFigure& figure : figuresNow(root))
                             values.emplace(std::move(figure.name), figure.value);
                           for (std::size_t i = 0; i < names.size(); ++i) {
                             if (const auto at = values.find(names[i]); at != values.end())
                               slots[i] = at->second;
                           }
                         });
  for (std::size_t i = 0; i < figures.size(); ++i) {
    const std::string_view name = figures[i].name;
    const std::size_t dot = name.find('.');
    const std::string_view figure = name.substr(dot + 1);
    const bool isDaily = std::ranges::binary_search(kDailyFigures, figure);
    const std::string drive = channelName(name.substr(0, dot));
    source.addSimple({"Health", drive, figures[i].unit}, drive + '.' + std::string(figure),
                     first + static_cast<std::uint32_t>(i),
                     isDaily ? kDailyCategory : kToolCategory);
  }
}

}  // namespace tavrel::live
