// Live services: sensors that block, files that stay open, recordings next to them, large tables.

#include <ctime>

#include "platform/linux/health/reading.h"
#include "platform/linux/live/live_machine.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/report_protocol.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

const std::string kZone = "/sys/class/thermal/thermal_zone";

// A machine below its own device root, and the channels of all its live services.
struct LiveMachineTest : testing::Test, DeviceServices {
  void subscribe() {
    sampling = live->subscribe();
    names.clear();
    for (const plist::Value& service : live->services()) {
      const auto record = service.dictionary();
      const auto driver = static_cast<std::uint64_t>(record.number("EntryID")->int64());
      for (const plist::Value& group : record.dictionary("Properties").array("IOReportLegend")) {
        for (const plist::Value& channel : group.dictionary().array("IOReportChannels")) {
          const auto id = static_cast<std::uint64_t>(channel.array().at(0).number()->int64());
          EXPECT_EQ(sampling->add(driver, id), kElementBytes);
          names.emplace_back(*channel.array().at(2).string());
        }
      }
    }
  }
  /// "NAME=VALUE " for each channel that has a value after an update. The first subscribes.
  std::string update() {
    if (!sampling) subscribe();
    sampling->update();
    std::string text;
    std::vector<std::byte> room(kElementBytes);
    for (std::size_t i = 0; i < names.size(); ++i) {
      if (sampling->write(i, room) == 0) continue;
      text += format("%s=%lld ", names[i], *loadLittle64(room, kElementFirstValue));
    }
    return text;
  }
  /// As a new process does.
  void startAgain() {
    sampling.reset();
    live = std::make_unique<LiveMachine>(root, log);
  }
  std::unique_ptr<LiveMachine> live = std::make_unique<LiveMachine>(root, log);
  std::unique_ptr<LiveSampling> sampling;
  std::vector<std::string> names;
};

TEST_F(LiveMachineTest, ASensorThatBlocksHidesNoOther) {
  for (const char* const zone : {"0", "1", "2"})
    write(kZone + zone + "/temp", std::string(zone) + "000\n");
  const std::string path = root.path(kZone + "1/temp");
  std::filesystem::remove(path);
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  write("/proc/uptime", "5\n");

  live = std::make_unique<LiveMachine>(root, log, LiveMachine::Options{300, 5000});
  const std::string others =
      "boot.seconds=5 thermal_zone0.zone_temp=0 thermal_zone2.zone_temp=2000 thermal.hottest=2000 ";
  EXPECT_EQ(update(), others);
  EXPECT_EQ(log.lines, Lines{path + " does not answer within 300 ms: left out until it does"});
  // Nobody waits for it again, or repeats the message.
  EXPECT_EQ(update(), others);
  EXPECT_EQ(log.lines.size(), 1U);
  Descriptor(open(path.c_str(), O_WRONLY | O_NONBLOCK));  // lets the thread go
}

TEST_F(LiveMachineTest, SumsNothingWithoutADeviceThatIsSilent) {
  const std::string battery = "/sys/class/power_supply/BAT";
  for (const char* const number : {"0", "1", "2"}) {
    write(battery + number + "/type", "Battery\n");
    write(battery + number + "/charge_full", std::string(number) + "000\n");
    write(battery + number + "/device/power/runtime_status", "active\n");
  }
  // As in a bay without a battery.
  const std::string none = root.path(battery + "2/charge_full");
  std::filesystem::remove(none);
  std::filesystem::create_symlink("nowhere", none);
  write("/proc/uptime", "5\n");
  startAgain();
  const std::string all =
      "boot.seconds=5 BAT0.charge_full_uah=0 BAT1.charge_full_uah=1000 "
      "battery.charge_full_uah=1000 ";
  EXPECT_EQ(update(), all);
  write(battery + "0/device/power/runtime_status", "suspended\n");
  EXPECT_EQ(update(), "boot.seconds=5 BAT1.charge_full_uah=1000 ");
  write(battery + "0/device/power/runtime_status", "active\n");
  EXPECT_EQ(update(), all);
}

TEST_F(LiveMachineTest, FewSensorsThatBlockKeepThreadsWaiting) {
  constexpr std::size_t kWaiting = limits::kWaitingSensors;
  Lines paths;
  for (std::size_t zone = 0; zone < kWaiting + 2; ++zone) {
    write(kZone + std::to_string(zone) + "/x", "");
    paths.push_back(root.path(kZone + std::to_string(zone) + "/temp"));
    ASSERT_EQ(mkfifo(paths.back().c_str(), 0600), 0);
  }
  write("/proc/uptime", "5\n");
  const auto threads = [] {
    const std::filesystem::directory_iterator all("/proc/self/task");
    return std::distance(begin(all), end(all));
  };
  const auto before = threads();

  live = std::make_unique<LiveMachine>(root, log, LiveMachine::Options{20, 5000});
  Lines lines;
  for (std::size_t zone = 0; zone < kWaiting; ++zone)
    lines.push_back(paths[zone] + " does not answer within 20 ms: left out until it does");
  for (int reading = 0; reading < 3; ++reading) {
    EXPECT_EQ(update(), "boot.seconds=5 ");
    EXPECT_LE(threads(), before + limits::kWaitingSensors);  // threads of earlier tests may end
    lines.push_back("2 sensors are left out of this reading, the first is " + paths[kWaiting]);
    EXPECT_EQ(log.lines, lines);
  }
  for (std::size_t zone = 0; zone < kWaiting; ++zone)
    Descriptor(open(paths[zone].c_str(), O_WRONLY | O_NONBLOCK));  // lets the thread go
}

TEST_F(LiveMachineTest, SaysWhatCannotBeListed) {
  write("/proc/uptime", "5\n");
  write("/sys/class/thermal/x", "");
  const std::string zones = root.path("/sys/class/thermal");
  const std::string records = root.path("/sys/fs/pstore");
  std::filesystem::remove_all(zones);
  std::filesystem::create_directories(root.path("/sys/fs"));
  for (const std::string& folder : {zones, records})
    std::filesystem::create_symlink(folder, folder);
  EXPECT_EQ(update(), "boot.seconds=5 ");
  const std::string line =
      "cannot list " + zones + ": Too many levels of symbolic links; not everything in it is shown";
  EXPECT_EQ(log.lines, (Lines{line, line})) << "cooling devices and zones";
}

TEST_F(LiveMachineTest, FilesStayOpenAndTheirChannelsTheSame) {
  const std::string path = kZone + "0/temp";
  write(path, "10\n");
  write("/proc/uptime", "1\n");
  write("/proc/softirqs", " CPU0\n HI: 1\n NET: 2\n");
  EXPECT_EQ(
      update(),
      "boot.seconds=1 softirq.HI=1 softirq.NET=2 thermal_zone0.zone_temp=10 thermal.hottest=10 ");
  write(path, "11\n");
  // A new file of the same name is not the file that is open.
  std::filesystem::remove(root.path("/proc/uptime"));
  write("/proc/uptime", "2\n");
  write("/proc/softirqs", " CPU0 CPU1\n HI: 3 7\n NET: 4 8\n");  // a processor came later
  EXPECT_EQ(
      update(),
      "boot.seconds=1 softirq.HI=3 softirq.NET=4 thermal_zone0.zone_temp=11 thermal.hottest=11 ");
  // A device that no longer answers loses only its own channels.
  write(path, "");
  EXPECT_EQ(update(), "boot.seconds=1 softirq.HI=3 softirq.NET=4 ");
}

TEST_F(LiveMachineTest, ManyProcessorsHideNothing) {
  for (const char* const policy : {"policy", "policy1x", "policy1000", "policy1001"})
    write(format("/sys/devices/system/cpu/cpufreq/%s/stats/total_trans", policy), "7\n");
  for (int i = 0; i < 1000; ++i) {
    std::filesystem::create_directory(
        root.path(format("/sys/devices/system/cpu/cpufreq/policy%d", i)));
  }
  write("/sys/devices/system/cpu/cpufreq/policy999/stats/total_trans", "8\n");
  write("/proc/uptime", "5\n");
  EXPECT_EQ(update(),
            "boot.seconds=5 policy1000.frequency_changes=7 policy1001.frequency_changes=7 "
            "policy999.frequency_changes=8 ");
}

TEST_F(LiveMachineTest, ManyInterfacesHideNothing) {
  std::string table = "one\ntwo\n";
  for (int i = 0; i < 10'000; ++i)
    table += format("if%d: %d 2\n", i, i);
  write("/proc/net/dev", table);
  write("/proc/uptime", "5\n");
  const std::string text = update();
  EXPECT_EQ(names.size(), 20'001U);
  EXPECT_TRUE(text.starts_with("boot.seconds=5 if0.rx_bytes=0 if0.rx_packets=2 "));
  EXPECT_TRUE(text.ends_with(" if9999.rx_bytes=9999 if9999.rx_packets=2 "));
}

TEST_F(LiveMachineTest, ATableThatIsTooLargeLosesWholeLines) {
  const std::string blanks(limits::kLiveFileBytes - 20, ' ');
  write("/proc/interrupts", " CPU0\n 1: 5" + blanks + "a\nNMI: 123456\n");
  EXPECT_EQ(update(), "irq.a=5 ");
  std::string table = " CPU8191\n";  // a short text that would claim much memory
  for (int i = 0; i < 200; ++i)
    table += format("%d: 1\n", i);
  write("/proc/interrupts", table);
  startAgain();
  EXPECT_EQ(live->services().size(), 1U);
  const std::string start = root.path("/proc/interrupts") + ": only the first ";
  EXPECT_EQ(log.lines, (Lines{start + "1 rows are shown", start + "128 rows are shown"}));
}

TEST_F(LiveMachineTest, ShowsTheInterfacesOfProcessOne) {
  write("/proc/net/dev", "one\ntwo\na=b: 1 2\n");
  EXPECT_EQ(update(), "a=b.rx_bytes=1 a=b.rx_packets=2 ");
  write("/proc/1/net/dev", "one\ntwo\neth0: 3 4\n");
  startAgain();
  EXPECT_EQ(update(), "eth0.rx_bytes=3 eth0.rx_packets=4 ");
}

// Only drive readings from this boot and the last two days count.
TEST_F(LiveMachineTest, ShowsReadingsOfDrivesThatHold) {
  using namespace health;
  write("/proc/sys/kernel/random/boot_id", "b1\n");
  const auto writeReading = [&](const char* drive, const char* boot, std::int64_t age,
                                const char* error, const Figures& figures) {
    Reading reading;
    reading.name = drive;
    reading.time = std::time(nullptr) - age;
    reading.boot = boot;
    reading.error = error;
    reading.figures = figures;
    reading.growth = {{figureKind(DriveKind::Nvme, "written"), 512'000}};
    write(format("/run/tavrel/health/%s.plist", drive), *encodeReading(reading));
  };
  const FigureKind* const spare = figureKind(DriveKind::Nvme, "spare_pct");
  const FigureKind* const hours = figureKind(DriveKind::Nvme, "power_on_hours");
  constexpr std::int64_t kTwoDays = std::int64_t{2} * 86'400;
  writeReading("nvme0", "b1", kTwoDays - 60, "", {{spare, 97}, {hours, 8}});
  writeReading("nvme1", "b1", kTwoDays + 60, "", {{spare, 1}});
  writeReading("nvme2", "b0", 0, "", {{spare, 2}});
  writeReading("nvme3", "b1", 0, "cannot read", {{spare, 3}});
  writeReading("nvme4", "b1", 0, "", {{spare, 4}});
  EXPECT_EQ(update(),
            "nvme0.power_on_hours=8 nvme0.spare_pct=97 nvme0.written_growth=512000 "
            "nvme4.spare_pct=4 nvme4.written_growth=512000 ");
  // Figures that a later reading lacks are unset, as are all figures of a drive that is gone.
  writeReading("nvme0", "b1", 0, "", {{spare, 96}});
  std::filesystem::remove(root.path("/run/tavrel/health/nvme4.plist"));
  EXPECT_EQ(update(), "nvme0.spare_pct=96 nvme0.written_growth=512000 ");
}

TEST_F(LiveMachineTest, ARecordedServiceTakesThePlaceOfALiveOne) {
  write("/proc/uptime", "5\n");
  write("/proc/vmstat", "oom_kill 1\n");
  write("/var/lib/tavrel/registry/a.plist",
        R"(<?xml version="1.0" encoding="UTF-8"?><plist version="1.0"><dict><key>Services</key>
<array><dict><key>Class</key><string>LinuxBoot</string><key>Name</key><string>boot</string></dict>
<dict><key>Class</key><string>LinuxMemory</string></dict></array></dict></plist>)");
  RecordedRegistry registry(root, files, coding, log, live.get());
  std::unique_ptr<ServiceIterator> services;
  EXPECT_EQ(registry.matchingServices(plist::Dictionary::create(), services), kKernelSuccess);
  std::string found;
  std::string name;
  while (const auto service = services->next())
    found += service->name(name) == kKernelSuccess ? name + ' ' : "? ";
  // The second one has the class of a live service, but a different name.
  EXPECT_EQ(found, "boot LinuxMemory memory IOReportHub ");
  EXPECT_EQ(registry.liveServices().size(), 1U);
  EXPECT_EQ(registry.recording().array("Services").size(), 2U);
}

}  // namespace
}  // namespace tavrel
