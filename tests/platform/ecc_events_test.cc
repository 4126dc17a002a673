// The queue of ECC events, and the errors that the kernel counts.
#include "platform/linux/ecc_events.h"

#include <cerrno>
#include <gtest/gtest.h>

#include "base/text.h"
#include "platform/linux/linux_system_controls.h"
#include "platform/plist/coding.h"
#include "temporary_root.h"

namespace tavrel {
namespace {

constexpr const char* kQueue = "/var/lib/tavrel/ecc-events/";
constexpr const char* kController = "/sys/devices/system/edac/mc/mc0/";

struct EccDevice : TemporaryRoot {
  KeptLog log;
  FileLayer files;
  plist::PlistCoding coding;

  EccDevice() {
    count("ce_count", 0);  // in the place of the machine's own
    write("/sys/devices/system/edac/mc/mc0x/ce_count", "9\n");
  }
  void count(const char* file, std::uint64_t errors) const {
    write(std::string(kController) + file, std::to_string(errors) + "\n");
  }
  void event(const char* name, char identifier) const {
    write(kQueue + std::string(name), identifier + std::string(kEccEventBytes - 1, '\0'));
  }
  EccEvents events(EccEvents::Mode mode = EccEvents::Mode::Consume) {
    return {root, files, coding, log, mode};
  }
  std::vector<std::string> queue() { return *files.list(root.path(kQueue)); }
};

/// Everything up to the end: error numbers, and "identifier: registers" of events.
std::string all(EccEvents& events) {
  std::string text;
  for (int reads = 0; reads < 20; ++reads) {
    std::array<std::byte, kEccEventBytes> buffer{};
    const auto result = events.next(buffer);
    if (result.errorNumber == ENOENT) return text;
    if (result.errorNumber != 0) {
      text += "errno " + std::to_string(result.errorNumber) + "; ";
      continue;
    }
    EXPECT_EQ(result.length, kEccEventBytes);
    text += std::to_string(std::to_integer<int>(buffer[0])) + ":";
    for (std::size_t i = 0; i < std::to_integer<std::size_t>(buffer[1]); ++i)
      text += " " + std::to_string(loadLittle64(buffer, 8 + 8 * i).value());
    text += "; ";
  }
  return text + "no end";
}

TEST(EccEvents, AreReadInOrderAndOnce) {
  EccDevice device;
  device.event("02.event", 2);
  device.event("10.event", 3);
  device.event("01.event", 1);
  device.write(std::string(kQueue) + "015.errno", "16\n");
  device.write(std::string(kQueue) + "03.event", "short");
  device.write(std::string(kQueue) + "04.errno", "4096");
  device.write(std::string(kQueue) + "notes", "kept");
  const auto before = device.queue();

  auto peek = device.events(EccEvents::Mode::Peek);
  EXPECT_EQ(all(peek), "1:; errno 16; 2:; 3:; ");
  EXPECT_EQ(all(peek), "");
  EXPECT_EQ(device.queue(), before);

  device.log.lines.clear();
  {
    LinuxSystemControls controls(device.root, device.files, device.coding, device.log);
    std::array<std::byte, kEccEventBytes + 8> buffer{};
    EXPECT_EQ(controls.read("kern.next_ecc_event", MutableByteSpan(buffer).first(71)).errorNumber,
              ENOMEM);
    EXPECT_EQ(controls.read("kern.next_ecc_event", buffer).errorNumber, 0);
    EXPECT_EQ(buffer[0], std::byte{1});
    EXPECT_EQ(device.queue().front(), "015.errno");
  }
  auto events = device.events();
  EXPECT_EQ(all(events), "errno 16; 2:; 3:; ");
  EXPECT_EQ(device.queue(),
            (std::vector<std::string>{"03.event.unusable", "04.errno.unusable", "notes"}));
  const std::string what =
      ": it is neither an event of 72 bytes nor an error number; it is set "
      "aside";
  EXPECT_EQ(device.log.lines, (std::vector{device.root.path(kQueue) + "03.event" + what,
                                           device.root.path(kQueue) + "04.errno" + what}));
  device.event("00.event", 7);  // that arrives while the reader lives
  EXPECT_EQ(all(events), "7:; ");
}

TEST(EccEvents, PublishWhatTheKernelHasCountedOnce) {
  EccDevice device;
  device.count("ce_count", 5);
  device.count("ue_count", 1);
  device.event("x.event", 9);
  device.event("a.event", 8);

  auto peek = device.events(EccEvents::Mode::Peek);
  EXPECT_EQ(all(peek), "8:; 1: 0 5 5; 2: 0 1 1; 9:; ");
  EXPECT_EQ(device.queue().size(), 2U);
  EXPECT_FALSE(FileLayer::status(device.root.path("/var/lib/tavrel/edac-counters.plist")));

  auto first = device.events();
  EXPECT_EQ(all(first), "8:; 1: 0 5 5; 2: 0 1 1; 9:; ");
  EXPECT_EQ(all(first), "");
  device.count("ce_count", 7);
  device.write(std::string(kController) + "ue_count", "?");  // unreadable this once
  EXPECT_EQ(all(first), "1: 0 2 7; ");
  device.count("ue_count", 1);
  auto second = device.events();
  EXPECT_EQ(all(second), "");
  device.count("ce_count", 3);  // the machine was started anew
  EXPECT_EQ(all(second), "1: 0 3 3; ");
  EXPECT_TRUE(device.log.lines.empty());
}

}  // namespace
}  // namespace tavrel
