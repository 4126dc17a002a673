
#include <sys/sysinfo.h>

#include "platform/linux/device/linux_dynamic_loader.h"
#include "platform/linux/device/linux_system_controls.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

constexpr std::string_view kControls = "/etc/tavrel/system-controls.plist";
constexpr std::string_view kLibraries = "/etc/tavrel/dynamic-libraries.plist";
constexpr std::string_view kFaultline =
    "/System/Library/PrivateFrameworks/FaultlineSupport.framework/FaultlineSupport";

class ControlsTest : public testing::Test, protected DeviceServices {
 protected:
  void writeList(std::string_view path, const plist::Value& value) {
    write(path, *coding.encodeXml(value));
  }

  EccEvents eccEvents{root, files, coding, log, EccEvents::Mode::Consume};
  LinuxSystemControls controls{root, files, coding, log, eccEvents};
};

TEST_F(ControlsTest, GivesRecordedValuesBeforeTheKernels) {
  const std::byte bytes[] = {std::byte{1}, std::byte{2}, std::byte{3}};
  writeList(kControls, plist::Dictionary{{"bytes", plist::Data(bytes)},
                                         {"twelve", 12},
                                         {"all ones", 4294967295},
                                         {"33 bits", 4294967296},
                                         {"minus two", -2},
                                         {"fails", plist::Dictionary{{"errno", EPERM}}},
                                         {"no errno", plist::Dictionary{{"errno", 0}}},
                                         {"real", 1.5},
                                         {"vm.swapusage", 7}});
  // The last column is the whole buffer, in hexadecimal.
  using Case = std::tuple<const char*, std::size_t, int, const char*>;
  for (const auto& [name, size, errorNumber, shown] :
       {Case("bytes", 4, 0, "010203ee"), Case("bytes", 2, ENOMEM, "eeee"),
        Case("twelve", 8, 0, "0c00000000000000"), Case("twelve", 0, ENOMEM, ""),
        Case("all ones", 4, 0, "ffffffff"), Case("all ones", 3, ENOMEM, "eeeeee"),
        Case("33 bits", 4, ENOMEM, "eeeeeeee"), Case("minus two", 9, 0, "feffffffffffffffff"),
        Case("fails", 4, EPERM, "eeeeeeee"), Case("no errno", 4, EINVAL, "eeeeeeee"),
        Case("real", 4, EINVAL, "eeeeeeee"),
        Case("vm.swapusage", 16, 0, "07000000000000000000000000000000"),
        Case("kern.memorystatus_thaw_count", 4, ENOENT, "eeeeeeee")}) {
    std::vector<std::byte> buffer(size, std::byte{0xee});
    const auto result = controls.read(name, buffer);
    EXPECT_EQ(result.errorNumber, errorNumber) << name << ' ' << size;
    std::string content;
    appendHex(content, buffer);
    EXPECT_EQ(content, shown) << name << ' ' << size;
  }
  const std::string start = root.path(kControls) + ": the value of ";
  const std::string end = " is neither bytes nor an integer nor {\"errno\": NUMBER}";
  EXPECT_EQ(log.lines, (Lines{start + "no errno" + end, start + "real" + end}));
}

TEST_F(ControlsTest, ReadsSwapFromTheKernel) {
  write(kControls, "<plist>");  // an unusable file hides nothing
  struct sysinfo machine {};
  sysinfo(&machine);
  std::array<std::byte, kSwapUsageBytes> record{};
  const auto result = controls.read("vm.swapusage", record);
  EXPECT_EQ(result.errorNumber, 0);
  EXPECT_EQ(result.length, kSwapUsageBytes);
  EXPECT_EQ(loadLittle64(record, 0), machine.totalswap * machine.mem_unit);
  EXPECT_EQ(loadLittle64(record, 8).value() + loadLittle64(record, 16).value(),
            loadLittle64(record, 0));
  EXPECT_EQ(log.lines.size(), 1U);  // read once

  std::string bytes;
  appendHex(bytes, swapUsageRecord(0x1122334455, 0x1022334455, 4096));
  EXPECT_EQ(bytes, "5544332211000000554433221000000000000000010000000010000000000000");
}

TEST_F(ControlsTest, OffersFunctionsUntilTheyAreTakenAway) {
  LinuxDynamicLoader loader(root, files, coding, log, preferences);
  EXPECT_EQ(loader.load("/usr/lib/libc.so.6"), nullptr);
  const auto library = loader.load(kFaultline);
  ASSERT_NE(library, nullptr);
  EXPECT_TRUE(std::holds_alternative<std::monostate>(library->find("abort")));
  const auto set = std::get<PreferenceSetter>(library->find("ZTXPreferencesSetValue"));
  const auto get =
      std::get<IntegerPreferenceGetter>(library->find("ZTXPreferencesGetIntegerValue"));
  set("Count", 3, "com.norvane.tallied");
  EXPECT_EQ(get("Count", "com.norvane.tallied"), 3);
  writeList(kLibraries,
            plist::Dictionary{{std::string(kFaultline), plist::Array{"ZTXPreferencesSetValue"}}});
  const auto partial = loader.load(kFaultline);
  ASSERT_NE(partial, nullptr);
  EXPECT_EQ(partial->find("ZTXPreferencesSetValue").index(), 0U);
  EXPECT_EQ(partial->find("ZTXPreferencesGetIntegerValue").index(), 1U);
  writeList(kLibraries, plist::Dictionary{{std::string(kFaultline), false}});
  EXPECT_EQ(loader.load(kFaultline), nullptr);
  EXPECT_EQ(log.lines, Lines{});
}

}  // namespace
}  // namespace tavrel
