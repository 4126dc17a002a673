// Live services: sensors that block, files that stay open, recordings next to them, large tables.

#include <ctime>
#include <fcntl.h>
#include <sys/stat.h>

#include "device_services.h"
#include "platform/linux/health/reading.h"
#include "platform/linux/live/live_machine.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/report_protocol.h"

namespace tavrel {
namespace {

const std::string kZone = "/sys/class/thermal/thermal_zone";

// The channels of all live services, subscribed.
struct Subscribed {
  explicit Subscribed(LiveServices& live) : sampling(live.subscribe()) {
    for (const plist::Value& service : live.services()) {
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
  /// "NAME=VALUE " for each channel that has a value after an update.
  std::string update() {
    sampling->update();
    std::string text;
    std::vector<std::byte> room(kElementBytes);
    for (std::size_t i = 0; i < names.size(); ++i) {
      if (sampling->write(i, room) == 0) continue;
      text += format("%s=%lld ", names[i], *loadLittle64(room, kElementFirstValue));
    }
    return text;
  }
  std::unique_ptr<LiveSampling> sampling;
  std::vector<std::string> names;
};

TEST(LiveMachineTest, ASensorThatBlocksHidesNoOther) {
  DeviceServices device;
  for (const char* const zone : {"0", "1", "2"})
    device.write(kZone + zone + "/temp", std::string(zone) + "000\n");
  const std::string path = device.root.path(kZone + "1/temp");
  std::filesystem::remove(path);
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  device.write("/proc/uptime", "5\n");

  LiveMachine live(device.root, device.log, {300, 5000});
  Subscribed channels(live);
  const std::string others =
      "boot.seconds=5 thermal_zone0.zone_temp=0 thermal_zone2.zone_temp=2000 thermal.hottest=2000 ";
  EXPECT_EQ(channels.update(), others);
  EXPECT_EQ(device.log.lines,
            Lines{path + " does not answer within 300 ms: left out until it does"});
  // Nobody waits for it again, or repeats the message.
  EXPECT_EQ(channels.update(), others);
  EXPECT_EQ(device.log.lines.size(), 1U);
  Descriptor(open(path.c_str(), O_WRONLY | O_NONBLOCK));  // lets the thread go
}

TEST(LiveMachineTest, FewSensorsThatBlockKeepThreadsWaiting) {
  constexpr std::size_t kWaiting = limits::kWaitingSensors;
  DeviceServices device;
  Lines paths;
  for (std::size_t zone = 0; zone < kWaiting + 2; ++zone) {
    device.write(kZone + std::to_string(zone) + "/x", "");
    paths.push_back(device.root.path(kZone + std::to_string(zone) + "/temp"));
    ASSERT_EQ(mkfifo(paths.back().c_str(), 0600), 0);
  }
  device.write("/proc/uptime", "5\n");
  const auto threads = [] {
    const std::filesystem::directory_iterator all("/proc/self/task");
    return std::distance(begin(all), end(all));
  };
  const auto before = threads();

  LiveMachine live(device.root, device.log, {20, 5000});
  Subscribed channels(live);
  Lines lines;
  for (std::size_t zone = 0; zone < kWaiting; ++zone)
    lines.push_back(paths[zone] + " does not answer within 20 ms: left out until it does");
  for (int reading = 0; reading < 3; ++reading) {
    EXPECT_EQ(channels.update(), "boot.seconds=5 ");
    EXPECT_LE(threads(), before + limits::kWaitingSensors);  // threads of earlier tests may end
    lines.push_back("2 sensors are left out of this reading, the first is " + paths[kWaiting]);
    EXPECT_EQ(device.log.lines, lines);
  }
  for (std::size_t zone = 0; zone < kWaiting; ++zone)
    Descriptor(open(paths[zone].c_str(), O_WRONLY | O_NONBLOCK));  // lets the thread go
}

TEST(LiveMachineTest, SaysWhatCannotBeListed) {
  DeviceServices device;
  device.write("/proc/uptime", "5\n");
  device.write("/sys/class/thermal/x", "");
  const std::string zones = device.root.path("/sys/class/thermal");
  const std::string records = device.root.path("/sys/fs/pstore");
  std::filesystem::remove_all(zones);
  std::filesystem::create_directories(device.root.path("/sys/fs"));
  for (const std::string& folder : {zones, records})
    std::filesystem::create_symlink(folder, folder);
  LiveMachine live(device.root, device.log);
  EXPECT_EQ(Subscribed(live).update(), "boot.seconds=5 ");
  const std::string line =
      "cannot list " + zones + ": Too many levels of symbolic links; not everything in it is shown";
  EXPECT_EQ(device.log.lines, (Lines{line, line})) << "cooling devices and zones";
}

TEST(LiveMachineTest, FilesStayOpen) {
  DeviceServices device;
  const std::string path = kZone + "0/temp";
  device.write(path, "10\n");
  device.write("/proc/uptime", "1\n");
  LiveMachine live(device.root, device.log);
  Subscribed channels(live);
  EXPECT_EQ(channels.update(), "boot.seconds=1 thermal_zone0.zone_temp=10 thermal.hottest=10 ");
  device.write(path, "11\n");
  // A new file of the same name is not the file that is open.
  std::filesystem::remove(device.root.path("/proc/uptime"));
  device.write("/proc/uptime", "2\n");
  EXPECT_EQ(channels.update(), "boot.seconds=1 thermal_zone0.zone_temp=11 thermal.hottest=11 ");
  // A device that no longer answers loses only its own channels.
  device.write(path, "");
  EXPECT_EQ(channels.update(), "boot.seconds=1 ");
}

TEST(LiveMachineTest, AProcessorThatComesLaterHasNoPlace) {
  DeviceServices device;
  device.write("/proc/softirqs", " CPU0\n HI: 1\n NET: 2\n");
  LiveMachine live(device.root, device.log);
  Subscribed channels(live);
  EXPECT_EQ(channels.update(), "softirq.HI=1 softirq.NET=2 ");
  device.write("/proc/softirqs", " CPU0 CPU1\n HI: 3 7\n NET: 4 8\n");
  EXPECT_EQ(channels.update(), "softirq.HI=3 softirq.NET=4 ");
}

TEST(LiveMachineTest, ManyProcessorsHideNothing) {
  DeviceServices device;
  for (const char* const policy : {"policy", "policy1x", "policy1000", "policy1001"})
    device.write(format("/sys/devices/system/cpu/cpufreq/%s/stats/total_trans", policy), "7\n");
  for (int i = 0; i < 1000; ++i) {
    std::filesystem::create_directory(
        device.root.path(format("/sys/devices/system/cpu/cpufreq/policy%d", i)));
  }
  device.write("/sys/devices/system/cpu/cpufreq/policy999/stats/total_trans", "8\n");
  device.write("/proc/uptime", "5\n");
  LiveMachine live(device.root, device.log);
  EXPECT_EQ(Subscribed(live).update(),
            "boot.seconds=5 policy1000.frequency_changes=7 policy1001.frequency_changes=7 "
            "policy999.frequency_changes=8 ");
}

TEST(LiveMachineTest, ManyInterfacesHideNothing) {
  DeviceServices device;
  std::string table = "one\ntwo\n";
  for (int i = 0; i < 10'000; ++i)
    table += format("if%d: %d 2\n", i, i);
  device.write("/proc/net/dev", table);
  device.write("/proc/uptime", "5\n");
  LiveMachine live(device.root, device.log);
  Subscribed channels(live);
  EXPECT_EQ(channels.names.size(), 20'001U);
  const std::string text = channels.update();
  EXPECT_TRUE(text.starts_with("boot.seconds=5 if0.rx_bytes=0 if0.rx_packets=2 "));
  EXPECT_TRUE(text.ends_with(" if9999.rx_bytes=9999 if9999.rx_packets=2 "));
}

TEST(LiveMachineTest, AFileThatIsTooLongLosesWholeLines) {
  DeviceServices device;
  const std::string blanks(limits::kLiveFileBytes - 20, ' ');
  device.write("/proc/interrupts", " CPU0\n 1: 5" + blanks + "a\nNMI: 123456\n");
  LiveMachine live(device.root, device.log);
  Subscribed channels(live);
  EXPECT_EQ(channels.update(), "irq.a=5 ");
  EXPECT_EQ(device.log.lines,
            Lines{device.root.path("/proc/interrupts") + ": only the first 1 rows are shown"});
}

TEST(LiveMachineTest, AShortTextClaimsLittleMemory) {
  DeviceServices device;
  std::string table = " CPU8191\n";
  for (int i = 0; i < 200; ++i)
    table += format("%d: 1\n", i);
  device.write("/proc/interrupts", table);
  LiveMachine live(device.root, device.log);
  EXPECT_EQ(live.services().size(), 1U);
  EXPECT_EQ(device.log.lines,
            Lines{device.root.path("/proc/interrupts") + ": only the first 128 rows are shown"});
}

TEST(LiveMachineTest, ShowsTheInterfacesOfProcessOne) {
  DeviceServices device;
  const auto shown = [&device] {
    LiveMachine live(device.root, device.log);
    return Subscribed(live).update();
  };
  device.write("/proc/net/dev", "one\ntwo\na=b: 1 2\n");
  EXPECT_EQ(shown(), "a=b.rx_bytes=1 a=b.rx_packets=2 ");
  device.write("/proc/1/net/dev", "one\ntwo\neth0: 3 4\n");
  EXPECT_EQ(shown(), "eth0.rx_bytes=3 eth0.rx_packets=4 ");
}

// Only drive readings from this boot and the last two days count.
TEST(LiveMachineTest, ShowsReadingsOfDrivesThatHold) {
  using namespace health;
  DeviceServices device;
  device.write("/proc/sys/kernel/random/boot_id", "b1\n");
  const auto writeReading = [&](const char* drive, const char* boot, std::int64_t age,
                                const char* error, const Figures& figures) {
    Reading reading;
    reading.name = drive;
    reading.time = std::time(nullptr) - age;
    reading.boot = boot;
    reading.error = error;
    reading.figures = figures;
    reading.growth = {{figureKind(DriveKind::Nvme, "written"), 512'000}};
    device.write(format("/run/tavrel/health/%s.plist", drive), *encodeReading(reading));
  };
  const FigureKind* const spare = figureKind(DriveKind::Nvme, "spare_pct");
  const FigureKind* const hours = figureKind(DriveKind::Nvme, "power_on_hours");
  constexpr std::int64_t kTwoDays = std::int64_t{2} * 86'400;
  writeReading("nvme0", "b1", kTwoDays - 60, "", {{spare, 97}, {hours, 8}});
  writeReading("nvme1", "b1", kTwoDays + 60, "", {{spare, 1}});
  writeReading("nvme2", "b0", 0, "", {{spare, 2}});
  writeReading("nvme3", "b1", 0, "cannot read", {{spare, 3}});
  writeReading("nvme4", "b1", 0, "", {{spare, 4}});
  LiveMachine live(device.root, device.log);
  Subscribed channels(live);
  EXPECT_EQ(channels.update(),
            "nvme0.power_on_hours=8 nvme0.spare_pct=97 nvme0.written_growth=512000 "
            "nvme4.spare_pct=4 nvme4.written_growth=512000 ");
  // Figures that a later reading lacks are unset, as are all figures of a drive that is gone.
  writeReading("nvme0", "b1", 0, "", {{spare, 96}});
  std::filesystem::remove(device.root.path("/run/tavrel/health/nvme4.plist"));
  EXPECT_EQ(channels.update(), "nvme0.spare_pct=96 nvme0.written_growth=512000 ");
}

TEST(LiveMachineTest, ARecordedServiceTakesThePlaceOfALiveOne) {
  DeviceServices device;
  device.write("/proc/uptime", "5\n");
  device.write("/proc/vmstat", "oom_kill 1\n");
  device.write(
      "/var/lib/tavrel/registry/a.plist",
      R"(<?xml version="1.0" encoding="UTF-8"?><plist version="1.0"><dict><key>Services</key>
<array><dict><key>Class</key><string>LinuxBoot</string><key>Name</key><string>boot</string></dict>
<dict><key>Class</key><string>LinuxMemory</string></dict></array></dict></plist>)");
  LiveMachine live(device.root, device.log);
  RecordedRegistry registry(device.root, device.files, device.coding, device.log, &live);
  std::unique_ptr<ServiceIterator> services;
  EXPECT_EQ(registry.matchingServices(plist::Dictionary::create(), services), kKernelSuccess);
  std::string names;
  std::string name;
  while (const auto service = services->next())
    names += service->name(name) == kKernelSuccess ? name + ' ' : "? ";
  // The second one has the class of a live service, but a different name.
  EXPECT_EQ(names, "boot LinuxMemory memory IOReportHub ");
  EXPECT_EQ(registry.liveServices().size(), 1U);
  EXPECT_EQ(registry.recording().array("Services").size(), 2U);
}

}  // namespace
}  // namespace tavrel
