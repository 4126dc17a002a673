// The kernel's figures as channels: from trees of files to reports.

#include <ctime>
#include <sys/stat.h>

#include "base/iso_date.h"
#include "catalogue/catalogue.h"
#include "device.h"

namespace tavrel {
namespace {

// A path as content makes a link to it. The path of a folder ends with '/', and has as its content
// the folder's files, which have one line each: "NAME=LINE,NAME=LINE".
struct File {
  std::string path, content;
};

const std::string kCpu = "/sys/devices/system/cpu/";
const std::string kZone = "/sys/class/thermal/";
const std::string kHwmon = "/sys/class/hwmon/";

// The catalogue has the channel with its unit, and also as a statistic if the daily run stores it.
void expectInCatalogue(const nlohmann::json& channel) {
  static const std::map<std::string, std::string_view> units = {
      {"s", "seconds"},        {"ms", "milliseconds"},
      {"us", "microseconds"},  {"ns", "nanoseconds"},
      {"B", "bytes"},          {"KiB", "KiB"},
      {"4KiB", "4-KiB pages"}, {"events", "count"},
      {"packets", "packets"},  {"mC", "thousandths of a degree Celsius"},
      {"mV", "millivolts"},    {"uV", "microvolts"},
      {"mA", "milliamperes"},  {"uA", "microamperes"},
      {"uW", "microwatts"},    {"uJ", "microjoules"}};
  const auto name = channel["name"].get<std::string>();
  const auto* const entry = catalogue::findChannel(channel["driver"].get<std::string>(),
                                                   channel["group"].get<std::string>(), name);
  ASSERT_TRUE(entry) << channel;
  if (channel["unit_label"].is_string()) {
    EXPECT_EQ(entry->unit, units.at(channel["unit_label"].get<std::string>())) << channel;
  }
  const std::string prefix = "com.norvane.ioreport.";
  const auto* const statistic = catalogue::findStatistic(prefix + name);
  ASSERT_TRUE(statistic) << channel;
  EXPECT_EQ(statistic->key == prefix + std::string(entry->key), channel["categories"] == 0x100)
      << channel;
}

struct LiveDevice : TemporaryDevice {
  LiveDevice(const std::vector<File>& files) {
    std::filesystem::create_directory(path("/proc"));
    for (const File& file : files) {
      if (file.path.ends_with('/')) {
        std::istringstream lines(file.content);
        for (std::string name, line; getline(lines, name, '=') && getline(lines, line, ',');)
          write(file.path + name, line + '\n');
      } else if (file.content.starts_with('/')) {
        std::filesystem::create_symlink(path(file.content), path(file.path));
      } else {
        write(file.path, file.content);
      }
    }
  }
  /// "NAME=VALUE ..." for the channels; an array's values separated by commas, a state's as
  /// "NAME:ENTRIES/RESIDENCY", with a '*' for the current state.
  std::string values(const std::string& options = {}) const {
    std::string text;
    const auto outcome = run("report sample --json " + options);
    const auto json = nlohmann::json::parse(outcome.out, nullptr, false);
    if (json.is_discarded()) return outcome.error;
    for (const auto& channel : json["channels"]) {
      expectInCatalogue(channel);
      text += channel["name"].get<std::string>() + '=';
      if (channel.contains("value")) text += channel["value"].dump();
      for (const auto& value : channel.value("values", nlohmann::json::array()))
        text += (value.is_null() ? "-" : value.dump()) + ',';
      bool hasTime = !channel.contains("states");
      for (const auto& state : channel.value("states", nlohmann::json::array())) {
        hasTime = hasTime || state["current"] == true;
        text += state["name"].get<std::string>() + ':' + state["in_transitions"].dump() + '/' +
                state["residency"].dump() + (state["current"] == true ? "* " : " ");
      }
      EXPECT_EQ(channel["timestamp"].is_null(), !hasTime);
      text += ' ';
    }
    return text;
  }
};

struct Row {
  std::vector<File> files;
  std::string values;
};

TEST(LiveTest, ReadsTheFormsOfTheKernel) {
  const Row rows[] = {
      {{{"/proc/uptime", "93784.87 12.01\n"}}, "boot.seconds=93784 "},
      {{{"/proc/pressure/io",
         "some avg10=0.00 avg60=1.00 avg300=0.00 total=77\nfull avg10=0.00 avg60=0.00 "
         "avg300=0.00 total=5\n"},
        {"/proc/pressure/irq", "full avg10=0.00 avg60=0.00 avg300=0.00 total=9\n"},
        {"/proc/pressure/cpu",
         "some avg10=0.00 avg60=1.00 avg300=0.00 total=7\nfull avg10=0.00 avg60=0.00 "
         "avg300=0.00 total=0\n"}},
       "cpu.pressure_some=7 io.pressure_some=77 io.pressure_full=5 irq.pressure_full=9 "},
      {{{"/proc/schedstat", "version 15\ntimestamp 1\ncpu1 0 0 0 0 0 0 11 22 33\ndomain0 3 9\n"}},
       "cpu1.sched_run=11 cpu1.sched_wait=22 cpu1.sched_slices=33 "},
      {{{"/proc/vmstat",
         "nr_free_pages 9\npswpin 3\npgpgin 2\noom_kill 1\npgscan_kswapd 5\nother x\n"}},
       "memory.paged_in=2048 memory.swapped_in=" + std::to_string(3 * sysconf(_SC_PAGESIZE)) +
           " memory.scanned_kswapd=" + std::to_string(5 * sysconf(_SC_PAGESIZE)) +
           " memory.oom_kills=1 "},
      {{{"/proc/meminfo",
         "MemTotal:       100 kB\nDirty:     x kB\nSlab: 7 kB\nHardwareCorrupted: 8 kB\n"}},
       "memory.total=100 memory.slab=7 memory.hardware_corrupted=8 "},
      // The second disk has the columns of older kernels; partitions are not devices.
      {{{"/proc/diskstats",
         " 8 0 sda 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16 17\n 8 1 sda1 1 2 3 4 5 6 7 8 9 10 11\n"
         " 8 16 c/d0 1 2 3 4 5 6 7 8 9 10 11\n"},
        {"/sys/block/sda/device/x", ""},
        {"/sys/block/c!d0/device/x", ""}},
       "sda.reads=1 sda.read_merges=2 sda.writes=5 sda.write_merges=6 sda.discards=12 "
       "sda.discard_merges=13 sda.flushes=16 sda.read_bytes=1536 sda.written_bytes=3584 "
       "sda.discarded_bytes=7168 sda.read_time=4 sda.write_time=8 sda.io_time=10 "
       "sda.weighted_time=11 sda.discard_time=15 sda.flush_time=17 sda.in_flight=9 c/d0.reads=1 "
       "c/d0.read_merges=2 c/d0.writes=5 c/d0.write_merges=6 c/d0.read_bytes=1536 "
       "c/d0.written_bytes=3584 c/d0.read_time=4 c/d0.write_time=8 c/d0.io_time=10 "
       "c/d0.weighted_time=11 c/d0.in_flight=9 disks.read_bytes=3072 disks.written_bytes=7168 "
       "disks.discarded_bytes=7168 disks.writes=10 disks.flushes=16 disks.io_time=20 "},
      // The second disk is made of the first, which is a path to it.
      {{{"/proc/diskstats", " 259 0 nvme0c0n1 1 2 3\n 259 1 nvme0n1 4 5 6\n"},
        {"/sys/block/nvme0c0n1/device/x", ""},
        {"/sys/block/nvme0n1/dev", "259:1\n"},
        {"/sys/devices/nvme-subsys0/x", ""},
        {"/sys/block/nvme0n1/device", "/sys/devices/nvme-subsys0"}},
       "nvme0c0n1.reads=1 nvme0c0n1.read_merges=2 nvme0c0n1.read_bytes=1536 nvme0n1.reads=4 "
       "nvme0n1.read_merges=5 nvme0n1.read_bytes=3072 disks.read_bytes=1536 "},
      {{{"/proc/net/dev", "1\n2\neth0: 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16\nbr0: 9\n"},
        {"/sys/class/net/eth0/device/x", ""}},
       "eth0.rx_bytes=1 eth0.tx_bytes=9 eth0.rx_packets=2 eth0.rx_errors=3 eth0.rx_dropped=4 "
       "eth0.rx_fifo_errors=5 eth0.rx_frame_errors=6 eth0.rx_compressed=7 eth0.rx_multicast=8 "
       "eth0.tx_packets=10 eth0.tx_errors=11 eth0.tx_dropped=12 eth0.tx_fifo_errors=13 "
       "eth0.tx_collisions=14 eth0.tx_carrier_errors=15 eth0.tx_compressed=16 br0.rx_bytes=9 "
       "net.rx_bytes=1 net.tx_bytes=9 net.rx_errors=3 net.rx_dropped=4 net.tx_errors=11 "
       "net.tx_dropped=12 "},
      {{{"/proc/stat",
         "cpu  9 8 7 6 5 4 3 2 1 0\ncpu2 1 2 3 4 5 6 7 8 9 10\nintr 44 1 2\n"
         "ctxt 55\nbtime 1\nprocesses 66\n"}},
       "cpu.user=90 cpu.nice=80 cpu.system=70 cpu.idle=60 cpu.iowait=50 cpu.irq=40 cpu.softirq=30 "
       "cpu.steal=20 cpu.interrupts=44 cpu.switches=55 cpu.forks=66 cpu2.user=10 cpu2.nice=20 "
       "cpu2.system=30 cpu2.idle=40 cpu2.iowait=50 cpu2.irq=60 cpu2.softirq=70 cpu2.steal=80 "
       "cpu2.guest=90 cpu2.guest_nice=100 "},
      {{{"/sys/block/zram0/", "mm_stat= 1 2 3 4 5 6,bd_stat=7 8 9,io_stat=10 11 12 13"}},
       "zram0.zram_data=1 zram0.zram_compressed=2 zram0.zram_used=3 zram0.zram_limit=4 "
       "zram0.zram_used_max=5 zram0.zram_same_pages=6 zram0.zram_backed=7 "
       "zram0.zram_backing_reads=8 zram0.zram_backing_writes=9 zram0.zram_failed_reads=10 "
       "zram0.zram_failed_writes=11 "},
      // Processor 1 is offline; handlers of interrupts matter, their numbers do not.
      {{{"/proc/interrupts",
         "       CPU0 CPU2\n 3: 1 2 GIC 9 Level     a, PCIe PME\n 4: 10 20 GIC 8 Edge      b c\n"
         " 5: 5 6 GIC 7 Edge      b c\n 6: 3 4   IO-APIC   9-fasteoi \n"
         " 7: 5 6 GIC 1 Edge    \nNMI: 7 8 Non-maskable\nERR: 4\n"}},
       "irq.a,PCIe_PME=1,-,2,-, irq.b_c=15,-,26,-, irq.6=3,-,4,-, irq.7=5,-,6,-, "
       "irq.NMI=7,-,8,-, irq.ERR=4,-,-,-, "},
      {{{"/proc/interrupts", " CPU0\n 1: -9223372036854775807  x\n 2: -1  x\n"}},
       "irq.x=-9223372036854775807,-,-,-, "},
      {{{kCpu + "cpu0/cpuidle/state0/", "name=POLL,time=5,usage=1"},
        {kCpu + "cpu0/cpuidle/state1/", "name=retention deep 1,time=6,usage=2"},
        {kCpu + "cpu0/cpuidle/state2/", "name=retention deep 2,time=7,usage=3"},
        {kCpu + "cpu1/cpuidle/state0/", "name=a,time=8"},
        {kCpu + "cpu1/cpuidle/state1/", "name=a,time=0"},
        {kCpu + "cpu1/cpuidle/state2/", "name=0:a,time=9"},
        // With an unknown residency, the shares of the others are unknown, too.
        {kCpu + "cpu2/cpuidle/state0/", "name=a,time=8"},
        {kCpu + "cpu2/cpuidle/state1/", "name=b"},
        {kCpu + "cpu2/cpuidle/state1/time", "\n"}},
       "cpu0.idle_states=POLL:1/5 1:retent:2/6 2:retent:3/7  "
       "cpu1.idle_states=0:a:null/8 1:a:null/0 2:0:a:null/9  "},
      {{{kCpu + "cpufreq/policy0/stats/time_in_state", "1800000 3\n600500 4\n"},
        {kCpu + "cpufreq/policy0/stats/trans_table",
         "   From  :    To\n         :   1800000    600500\n  1800000:         0         7\n"
         "   600500:         8         0\n"},
        {kCpu + "cpufreq/policy0/stats/total_trans", "15\n"},
        {kCpu + "cpufreq/policy0/scaling_cur_freq", "600500\n"}},
       "policy0.frequency=1800MHz:8/30 600500k:7/40*  policy0.frequency_changes=15 "},
      {{{"/sys/class/devfreq/gpu/trans_stat",
         "     From  :   To\n           : 200000000 400000000   time(ms)\n"
         "*  200000000:         042949672951234567890\n"
         "   400000000:         2         012345678901\nTotal transition : 5\n"},
        {"/sys/class/devfreq/gpu/cur_freq", "200000000"},
        {"/sys/class/devfreq/bus/trans_stat", "2000:  0  3  12\n*4000:  2  0  34\nTotal : 5\n"},
        // A row is missing, in which case transitions look like times; the others have an entry too
        // many, a last field that is too short, and fields of 12 characters.
        {"/sys/class/devfreq/cut/trans_stat",
         "2000:         0         3         41234567890\n"
         "4000:         2         0         51234567890\n"},
        {"/sys/class/devfreq/long/trans_stat", "2000:  0  3  12\n4000:  2  0  3  4\nTotal : 5\n"},
        {"/sys/class/devfreq/short/trans_stat",
         "2000:  0  3  12\n4000:         2123456789034\nTotal : 5\n"},
        {"/sys/class/devfreq/wide/trans_stat",
         "2000:  0  3  12\n4000:         123         4561234567890\nTotal : 5\n"}},
       "bus.frequency=2k:2/12 4k:3/34  gpu.frequency=200MHz:2/1234567890* "
       "400MHz:4294967295/12345678901  "},
      // Without the whole table of transitions, the entries are unknown, not 0 or too low.
      {{{kCpu + "cpufreq/policy0/stats/time_in_state", "3000 1\n2000 2\n1000 3\n"},
        {kCpu + "cpufreq/policy0/stats/trans_table",
         "   From  :    To\n   :  3000  2000  1000\n 3000:  0  4  5\n 2000:  7"},
        {kCpu + "cpufreq/policy1/stats/time_in_state", "2000 4\n1000 5\n"},
        {kCpu + "cpufreq/policy1/stats/trans_table", "   :  2000  1000\n 2000:  0  4\n"}},
       "policy0.frequency=3MHz:null/10 2MHz:null/20 1MHz:null/30  "
       "policy1.frequency=2MHz:null/40 1MHz:null/50  "},
      {{{kZone + "cooling_device0/", "type=fan"},
        {kZone + "cooling_device0/stats/time_in_state_ms", "state0\t5\nstate1\t6\n"},
        {kZone + "cooling_device1/", "type=cpu,cur_state=1"},
        {kZone + "cooling_device1/stats/time_in_state_ms", "state0\t7\nstate1\t8\n"},
        {kZone + "cooling_device1/stats/trans_table",
         " From  :    To\n       : state 0  state 1\nstate 0:       0       9\n"
         "state 1:       3       0\n"}},
       "fan.cooling_states=state0:null/5 state1:null/6  cpu.cooling_states=state0:3/7 "
       "state1:9/8*  "},
      {{{kZone + "thermal_zone0/", "type=soc,temp=41000"},
        {kZone + "thermal_zone1/", "type=acpitz,temp=-5000"},
        {kZone + "thermal_zone2/", "type=acpitz,temp=39000"}},
       "soc.zone_temp=41000 acpitz@thermal_zone1.zone_temp=-5000 "
       "acpitz@thermal_zone2.zone_temp=39000 thermal.hottest=41000 "},
      {{{kHwmon + "hwmon1/",
         "name=chip,temp10_input=1,temp1x_input=9,in0_input=2,temp1_crit=9,fan1_input=3"}},
       "chip.temp10=1 chip.in0=2 chip.fan1=3 sensors.hottest=1 "},
      {{{"/sys/class/power_supply/BAT0/", "cycle_count=210,energy_full_design=7,temp=305"}},
       "BAT0.cycles=210 BAT0.energy_design_uwh=7 BAT0.battery_temp=30500 battery.cycles=210 "
       "battery.energy_design_uwh=7 "},
      {{{"/sys/class/powercap/p/", "name=p,energy_uj=1,max_energy_range_uj=2"},
        {"/sys/class/wakeup/wakeup1/",
         "name=w,active_count=3,event_count=4,wakeup_count=5,expire_count=6,total_time_ms=7,"
         "max_time_ms=8,prevent_suspend_time_ms=9"}},
       "p.energy=1 p.energy_range=2 w.wakeup_active=3 w.wakeup_events=4 w.wakeup_aborts=5 "
       "w.wakeup_expired=6 w.wakeup_total=7 w.wakeup_longest=8 w.wakeup_prevented=9 "},
      {{{"/sys/devices/system/edac/mc/",
         "mc0/ce_count=4,mc0/dimm1/dimm_ce_count=3,mc0/rank4/dimm_ue_count=6,"
         "mc0/csrow0/ce_count=9,mc1/ce_count=5,mc2/ce_count=unknown"}},
       "mc0.corrected=4 mc0.dimm1.corrected=3 mc0.rank4.uncorrected=6 mc1.corrected=5 "
       "memory.corrected_errors=9 "},
      {{{"/sys/power/suspend_stats/", "success=4,fail=1,failed_suspend_noirq=2,max_hw_sleep=3"}},
       "suspend.success=4 suspend.failed=1 suspend.failed_suspend_noirq=2 "
       "suspend.longest_hw_sleep=3 "},
      {{{"/sys/fs/ext4/sda1/", "errors_count=2,lifetime_write_kbytes=3,session_write_kbytes=4"},
        {"/sys/fs/ext4/features/x", "supported\n"},
        {"/sys/fs/f2fs/sda2/", "lifetime_write_kbytes=5,free_segments=6,gc_background_calls=7"}},
       "sda1.fs_errors=2 sda1.fs_lifetime_written=3 sda1.fs_session_written=4 fs.errors=2 "
       "fs.lifetime_written=3 sda2.fs_lifetime_written=5 sda2.fs_free_segments=6 "
       "sda2.fs_gc_background=7 f2fs.lifetime_written=5 "},
      {{{"/sys/fs/pstore/dmesg-ramoops-0", ""}, {"/sys/class/watchdog/watchdog0/bootstatus", "32"}},
       "boot.crash_records=1 watchdog0.bootstatus=32 boot.watchdog_status=32 "},
      {{{"/sys/fs/cgroup/unified/b.slice/cgroup.events", "populated 1\n"},
        {"/sys/fs/cgroup/unified/b.slice/cpu.stat", "usage_usec 10\n"}},
       "b.slice.cpu=10 "},
      {{{"/sys/fs/cgroup/cgroup.controllers", "cpu"},
        {"/sys/fs/cgroup/a.slice/cgroup.events", "populated 1\n"},
        {"/sys/fs/cgroup/a.slice/cpu.stat", "usage_usec 10\nnr_throttled 2\nthrottled_usec 3\n"},
        {"/sys/fs/cgroup/a.slice/memory.events", "low 0\noom_kill 1\n"},
        {"/sys/fs/cgroup/a.slice/", "memory.current=4096,memory.peak=max"},
        // The mapping passes its figures on to the disks; two devices have had no I/O.
        {"/sys/fs/cgroup/a.slice/io.stat",
         "254:0 \n254:1 rbytes=5 wbytes=5 rios=5 wios=5\n7:1 8:0 rbytes=1 wbytes=2 rios=3 wios=4 "
         "dbytes=0 dios=0\n8:16 cost.usage=9 rbytes=10 wbytes=20 rios=30 wios=40\n"},
        {"/sys/block/", "sda/dev=8:0,sda/device/x=-,sdb/dev=8:16,sdb/device/x=-,dm-1/dev=254:1"}},
       "a.slice.cpu=10 a.slice.cpu_throttled=3 a.slice.cpu_throttles=2 a.slice.memory_oom_kills=1 "
       "a.slice.io_reads=33 a.slice.io_writes=44 a.slice.io_read_bytes=11 "
       "a.slice.io_written_bytes=22 a.slice.memory=4096 "},
  };
  for (const Row& row : rows) {
    const LiveDevice device(row.files);
    // Grouped by unit; here the channels are in the order of the report.
    EXPECT_EQ(device.values(), row.values) << row.files[0].path;
  }
}

TEST(LiveTest, OneBadFileHidesNothingElse) {
  const std::string zone = kZone + "thermal_zone";
  const std::string garbage(4096, '\x7f');
  const LiveDevice device({{zone + "0/", "type=a,temp=1"},
                           {zone + "1/", "type=empty"},
                           {zone + "1/temp", ""},
                           {zone + "2/", "type=folder,temp/x=-"},
                           {zone + "3/type", garbage},
                           {zone + "3/temp", garbage},
                           {zone + "4/", "type=bell\a,temp=99999999999999999999"},
                           {zone + "5/", "type=" + std::string(300, 'n') + ",temp=0x10"},
                           {zone + "6/", "type=half,temp=12 34"},
                           {"/proc/interrupts", ""},
                           {"/proc/stat", garbage},
                           {"/proc/diskstats", "\n\n8\n8 0\n8 0 sda\n"},
                           {"/sys/block/sda/x", ""},
                           {"/proc/net/dev", "one\ntwo\n"},
                           {"/proc/uptime", "soon\n"}});
  EXPECT_EQ(device.values(), "a.zone_temp=1 bell_~7ef23bcd.zone_temp=9223372036854775807 " +
                                 std::string(55, 'n') +
                                 "~088f4495.zone_temp=16 thermal.hottest=9223372036854775807 ");
  const Outcome sample = device.run("report sample --group Thermal");
  EXPECT_EQ(sample.status, 0);
  EXPECT_EQ(sample.error,
            "tavrelctl: 4 channels without values: their devices do not report them now, or the "
            "hub does not know them\n");
}

TEST(LiveTest, ARootShowsOnlyItsOwnFolders) {
  const TemporaryDevice bare;
  bare.write("/sys/devices/system/edac/mc/mc0/ce_count", "1\n");
  bare.check("report list", prints("no channels\n"));
  bare.check("report sample --live",
             fails("no live channels: " + bare.path("/proc") +
                   " is missing: link /proc and /sys into the device root"));
  // With the link, the root uses the machine's own folder.
  std::filesystem::create_symlink("/proc", bare.path("/proc"));
  EXPECT_EQ(bare.run("report sample --group Boot --live").status, 0);
}

TEST(LiveTest, DrivesAsleepAreNotRead) {
  const LiveDevice device({{kHwmon + "hwmon0/",
                            "name=drivetemp,temp1_input=30000,temp1_lowest=20000,"
                            "device/power/runtime_status=suspended"}});
  EXPECT_EQ(device.values(), "");
  device.write(kHwmon + "hwmon0/device/power/runtime_status", "active\n");
  Openings asked(device.path(kHwmon + "hwmon0/device/power/runtime_status"));
  EXPECT_EQ(device.values(),
            "drivetemp.temp1=30000 drivetemp.temp1_lowest=20000 sensors.hottest=30000 ");
  EXPECT_EQ(asked.take(), 1);  // not for each figure
}

// A recording plays back the same values, in place of the live services.
TEST(LiveTest, RecordsWhatIsLive) {
  const LiveDevice device({{"/proc/uptime", "7.00 1.00\n"},
                           {"/proc/softirqs", "     CPU0 CPU1\n HI: 1 2\n"},
                           {kZone + "thermal_zone0/temp", "5\n"},
                           {kZone + "thermal_zone1/temp", "\n"}});
  const Outcome live = device.run("report sample");
  const std::string file = device.path("/live.plist");
  EXPECT_EQ(device.run("registry record --live " + file), prints(""));
  TemporaryDevice other;
  other.write("/var/lib/tavrel/registry/live.plist", contentOf(file));
  EXPECT_EQ(other.run("report sample").out, live.out);
  other.check("report list --live", prints("no channels\n"));
  EXPECT_EQ(other.run("report list --recorded").out, device.run("report list --live").out);

  // Ids depend neither on the machine nor on the boot.
  other.write("/proc/uptime", "8.00 1.00\n");
  other.write(kZone + "thermal_zone1/temp", "9\n");  // it had no value when it was recorded
  EXPECT_EQ(other.run("report sample").out, live.out);
  EXPECT_EQ(device.run("registry list").out, other.run("registry list").out);

  {
    const PendingSignal term(SIGTERM);
    device.check("registry record --live --seconds 3600 " + file,
                 {0, "", "tavrelctl: ended by a signal before 3600 seconds were over\n"});
  }
  other.write("/var/lib/tavrel/registry/live.plist", contentOf(file));
  EXPECT_EQ(other.run("report sample").out, live.out);
  device.check("registry record --seconds 1 -",
               fails("--seconds is for --live: recordings are written as they are", 2));
}

// Recordings of real machines.
TEST(LiveTest, PlaysTheExamplesBack) {
  const auto played = [](const std::string& example, const std::vector<std::string>& names) {
    const TemporaryDevice device;
    device.write("/var/lib/tavrel/registry/a.plist",
                 contentOf(TAVREL_EXAMPLES "/registry/live/" + example));
    std::string text;
    const auto sample = device.json("report sample");
    for (const auto& channel : sample["channels"]) {
      const auto name = channel["name"].get<std::string>();
      if (std::ranges::find(names, name) == names.end()) continue;
      text += name + '=' + channel["value"].dump() + ' ';
    }
    return text;
  };
  EXPECT_EQ(played("machine.plist", {"boot.seconds", "vda.written_bytes", "io.pressure_some"}),
            "boot.seconds=7702 io.pressure_some=64081690 vda.written_bytes=73419911168 ");
  EXPECT_EQ(played("guest.plist", {"nvme0.critical_warning", "nvme0.temperature", "ubi0.blocks"}),
            "nvme0.critical_warning=4 nvme0.temperature=49850 ubi0.blocks=8192 ");
}

TEST(LiveTest, TheDailyRunStoresTheHealthOfDrives) {
  const LiveDevice device({{"/proc/sys/kernel/random/boot_id", "b1\n"},
                           {kWhitelistFile, contentOf(TAVREL_EXAMPLES "/whitelist-live.plist")}});
  device.writeDrive("nvme0", "nvme",
                    R"("spare_pct": 97, "critical_warning": 16, "written": 5, "power_on_hours": 6)",
                    isoDateText(plist::Date::since1970(static_cast<double>(std::time(nullptr)))),
                    R"("boot": "b1", "growth": {"written": 2048000, "power_on_hours": 1}, )");
  std::vector<std::string> stored;
  const auto rehearsal = device.json("rehearse --today");
  for (const auto& step : rehearsal["steps"]) {
    for (const auto& event : step["events"]) {
      const std::string subject = event.value("subject", "");
      if (subject.starts_with("com.norvane.ioreport."))
        stored.push_back(subject.substr(21) + '=' + event["value"].dump());
    }
  }
  EXPECT_EQ(stored, (std::vector<std::string>{"nvme0.critical_warning=16", "nvme0.spare_pct=97",
                                              "nvme0.written_growth=2048000"}));
  // A mask is not coarsened; everything else about a drive is, to one figure.
  const auto rules = device.json(
      "whitelist explain com.norvane.ioreport.nvme0.written_growth "
      "com.norvane.ioreport.nvme0.critical_warning --value 2048000");
  EXPECT_EQ(rules["keys"][0]["scalar"]["reported_value"], 2'000'000);
  EXPECT_EQ(rules["keys"][1]["scalar"]["reported_value"], 2'048'000);
}

// The catalogue has the channels of this machine. The example includes each daily figure of them,
// and passes the whitelist check.
TEST(LiveTest, TheCatalogueAndTheExampleHaveWhatThisMachineHas) {
  const TemporaryDevice device;
  const std::string file = TAVREL_EXAMPLES "/whitelist-live.plist";
  EXPECT_EQ(device.run("whitelist check " + file).status, 0);
  const Outcome list = TemporaryDevice::runAt("/", "report list --live --json");
  const auto json = nlohmann::json::parse(list.out);
  EXPECT_GE(json["channels"].size(), 100U);
  CommandLine explain{"whitelist", "explain", "--json", "--file", file};
  for (const auto& channel : json["channels"]) {
    expectInCatalogue(channel);
    if (channel["categories"] == 0x100)
      explain.push_back("com.norvane.ioreport." + channel["name"].get<std::string>());
  }
  EXPECT_GE(explain.size(), 5U + 10);
  const auto explained = nlohmann::json::parse(device.run(explain).out);
  for (const auto& key : explained["keys"])
    EXPECT_TRUE(key["scalar"]["rule"] == "exact" || key["scalar"]["rule"] == "prefix") << key;
}

}  // namespace
}  // namespace tavrel
