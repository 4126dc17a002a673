#include "platform/linux/live/device_tables.h"

namespace tavrel::live {
namespace {

constexpr Scale kTenths{100, 1};  // of a degree, to thousandths
constexpr Daily kHottestZone{"thermal.hottest", LiveSource::Fold::Largest};
constexpr Daily kHottestSensor{"sensors.hottest", LiveSource::Fold::Largest};

// file, channel, unit

constexpr Attribute kThermalZone[] = {
    {"temp", "zone_temp", kMillidegrees, {}, kHottestZone},
};

constexpr Attribute kSensors[] = {
    {"temp*_input", "temp*", kMillidegrees, {}, kHottestSensor},
    {"temp*_highest", "temp*_highest", kMillidegrees},
    {"temp*_lowest", "temp*_lowest", kMillidegrees},
    {"in*_input", "in*", kMillivolts},
    {"curr*_input", "curr*", kMilliamperes},
    {"power*_input", "power*", kMicrowatts},
    {"power*_average", "power*_average", kMicrowatts},
    {"energy*_input", "energy*", kMicrojoules},
    {"humidity*_input", "humidity*", kPlain},
    {"fan*_input", "fan*", kPlain},
};

constexpr Attribute kRegulator[] = {
    {"microvolts", "voltage", kMicrovolts},
    {"microamps", "current", kMicroamperes},
};

constexpr Attribute kPowerZone[] = {
    {"energy_uj", "energy", kMicrojoules},
    {"max_energy_range_uj", "energy_range", kMicrojoules},
};

constexpr Attribute kPowerSupply[] = {
    {"online", "online", kPlain},
    {"capacity", "charge_percent", kPlain},
    {"cycle_count", "cycles", kEvents, {}, {"battery.cycles", LiveSource::Fold::Largest}},
    {"charge_now", "charge_uah", kPlain},
    {"charge_full", "charge_full_uah", kPlain, {}, {"battery.charge_full_uah"}},
    {"charge_full_design", "charge_design_uah", kPlain, {}, {"battery.charge_design_uah"}},
    {"energy_now", "energy_uwh", kPlain},
    {"energy_full", "energy_full_uwh", kPlain, {}, {"battery.energy_full_uwh"}},
    {"energy_full_design", "energy_design_uwh", kPlain, {}, {"battery.energy_design_uwh"}},
    {"voltage_now", "supply_voltage", kMicrovolts},
    {"current_now", "supply_current", kMicroamperes},
    {"power_now", "supply_power", kMicrowatts},
    {"temp", "battery_temp", kMillidegrees, kTenths},
};

constexpr Attribute kMemoryController[] = {
    {"ce_count", "corrected", kEvents, {}, {"memory.corrected_errors"}},
    {"ue_count", "uncorrected", kEvents, {}, {"memory.uncorrected_errors"}},
    {"ce_noinfo_count", "corrected_noinfo", kEvents},
    {"ue_noinfo_count", "uncorrected_noinfo", kEvents},
};

constexpr Attribute kMemoryModule[] = {
    {"dimm_ce_count", "corrected", kEvents},
    {"dimm_ue_count", "uncorrected", kEvents},
};

constexpr Attribute kWakeupSource[] = {
    {"active_count", "wakeup_active", kEvents},
    {"event_count", "wakeup_events", kEvents},
    {"wakeup_count", "wakeup_aborts", kEvents},
    {"expire_count", "wakeup_expired", kEvents},
    {"total_time_ms", "wakeup_total", kMilliseconds},
    {"max_time_ms", "wakeup_longest", kMilliseconds},
    {"prevent_suspend_time_ms", "wakeup_prevented", kMilliseconds},
};

constexpr Attribute kWatchdog[] = {
    {"bootstatus", "bootstatus", kPlain, {}, {"boot.watchdog_status", LiveSource::Fold::Largest}},
};

constexpr Attribute kExt4[] = {
    {"errors_count", "fs_errors", kEvents, {}, {"fs.errors"}},
    {"warning_count", "fs_warnings", kEvents},
    {"lifetime_write_kbytes", "fs_lifetime_written", kKibibytes, {}, {"fs.lifetime_written"}},
    {"session_write_kbytes", "fs_session_written", kKibibytes},
};

constexpr Attribute kF2fs[] = {
    {"lifetime_write_kbytes", "fs_lifetime_written", kKibibytes, {}, {"f2fs.lifetime_written"}},
    {"dirty_segments", "fs_dirty_segments", kPlain},
    {"free_segments", "fs_free_segments", kPlain},
    {"gc_foreground_calls", "fs_gc_foreground", kEvents},
    {"gc_background_calls", "fs_gc_background", kEvents},
    {"cp_foreground_calls", "fs_cp_foreground", kEvents},
};

constexpr Attribute kSuspend[] = {
    {"success", "suspend.success", kEvents, {}, kItself},
    {"fail", "suspend.failed", kEvents, {}, kItself},
    {"failed_freeze", "suspend.failed_freeze", kEvents},
    {"failed_prepare", "suspend.failed_prepare", kEvents},
    {"failed_suspend", "suspend.failed_suspend", kEvents},
    {"failed_suspend_late", "suspend.failed_suspend_late", kEvents},
    {"failed_suspend_noirq", "suspend.failed_suspend_noirq", kEvents},
    {"failed_resume", "suspend.failed_resume", kEvents},
    {"failed_resume_early", "suspend.failed_resume_early", kEvents},
    {"failed_resume_noirq", "suspend.failed_resume_noirq", kEvents},
    {"last_hw_sleep", "suspend.last_hw_sleep", kMicroseconds},
    {"total_hw_sleep", "suspend.total_hw_sleep", kMicroseconds},
    {"max_hw_sleep", "suspend.longest_hw_sleep", kMicroseconds},
};

// class, name, group; folder, prefix of its entries, file with the name, always with the device
constexpr DeviceClass kClasses[] = {
    {"LinuxThermal", "thermal", "Thermal", "/sys/class/thermal", "thermal_zone", "type", false,
     Speed::Slow, kThermalZone},
    {"LinuxSensors", "sensors", "Sensors", "/sys/class/hwmon", "hwmon", "name", true, Speed::Slow,
     kSensors},
    {"LinuxRegulators", "regulators", "Regulators", "/sys/class/regulator", "regulator", "name",
     false, Speed::Slow, kRegulator},
    {"LinuxPowerSupply", "power-supply", "Power Supply", "/sys/class/power_supply", "", "", false,
     Speed::Slow, kPowerSupply},
    {"LinuxEnergy", "energy", "Energy", "/sys/class/powercap", "", "name", false, Speed::Quick,
     kPowerZone},
    {"LinuxMemoryErrors", "memory-errors", "Memory", "/sys/devices/system/edac/mc", "mc", "", false,
     Speed::Quick, kMemoryController, kMemoryModule},
    {"LinuxWakeup", "wakeup", "Wakeup", "/sys/class/wakeup", "wakeup", "name", false, Speed::Quick,
     kWakeupSource},
    {"LinuxWatchdog", "watchdog", "Boot", "/sys/class/watchdog", "watchdog", "", false,
     Speed::Quick, kWatchdog},
    {"LinuxExt4", "ext4", "File Systems", "/sys/fs/ext4", "", "", false, Speed::Quick, kExt4},
    {"LinuxF2fs", "f2fs", "File Systems", "/sys/fs/f2fs", "", "", false, Speed::Quick, kF2fs},
};

}  // namespace

std::span<const DeviceClass> deviceClasses() {
  return kClasses;
}

std::span<const Attribute> suspendAttributes() {
  return kSuspend;
}

}  // namespace tavrel::live
