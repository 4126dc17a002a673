#include <cmath>

#include "platform/linux/locale/linux_date_formatting.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

constexpr std::string_view kPattern = "yyyy-MM-dd HH:mm:ss Z";

// One block of a zone file: UTC from the earliest instant that a word of this size can hold.
std::string zoneBlock(std::size_t wordBytes) {
  std::string block("TZif2");
  block.resize(20);
  for (const int count : {0, 0, 0, 1, 1, 4})  // at the end: transitions, kinds of time, their names
    block.append(3, '\0').push_back(static_cast<char>(count));
  block.append("\x80").append(wordBytes - 1, '\0');
  block.append(1, '\0');  // the first kind of time
  block.append(6, '\0');  // its offset, daylight saving, name
  return block.append("UTC\0", 4);
}

// A zone file in which `rule`, a zone in POSIX form, applies at all times.
std::string zoneFile(std::string_view rule) {
  return zoneBlock(4).append(zoneBlock(8)).append("\n").append(rule).append("\n");
}

TEST(DateFormatting, PrintsTheTimeOfTheDevicesZone) {
  // Instants are seconds since 1970; one of them is in the year before year 1.
  static constexpr std::tuple<const char*, double, const char*, std::string_view> kCases[] = {
      {"UTC0", 1794852138.75, "2026-11-16 18:02:18 +0000", kPattern},
      {"<+0545>-5:45", 1794852138, "2026-11-16 23:47:18 +0545", kPattern},
      {"<-0330>3:30", 0, "1969-12-31 20:30:00 -0330", kPattern},
      {"<-12>12", -0.5, "1969-12-31 11:59:59 -1200", kPattern},
      {"<-00>0:00:30", 60, "1970-01-01 00:00:30 +0000", kPattern},
      {"CET-1CEST,M3.5.0,M10.5.0/3", 1774745999, "2026-03-29 01:59:59 +0100", kPattern},
      {"CET-1CEST,M3.5.0,M10.5.0/3", 1774746000, "2026-03-29 03:00:00 +0200", kPattern},
      {"<+14>-14", 253402300800, "10000-01-01 14:00:00 +1400", kPattern},
      {"UTC0", -62135596801, "0001-12-31 23:59:59 +0000", kPattern},
      {nullptr, NAN, "1970-01-01 00:00:00 +0000", kPattern},
      {nullptr, 1e300, "292277026596 QQ'yyyMMM%d", "yyyy QQ'yyyMMM%d"},
      {nullptr, -1e300, "292277022658", "yyyy"}};
  const std::filesystem::path folder = std::filesystem::current_path();
  for (const auto& [rule, instant, text, pattern] : kCases) {
    const TemporaryRoot device;  // a separate file for each zone
    device.write("/etc/localtime", rule ? zoneFile(rule) : "no zone file");
    const DeviceRoot relative(".");
    std::filesystem::current_path(device.root.path("/"));
    for (const DeviceRoot* root : {&device.root, &relative}) {
      LinuxDateFormatting formatting(*root);
      EXPECT_EQ(formatting.format(plist::Date::since1970(instant), pattern, "en_US_POSIX"), text);
    }
    std::filesystem::current_path(folder);
  }
}

}  // namespace
}  // namespace tavrel
