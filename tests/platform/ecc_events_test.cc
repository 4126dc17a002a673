// The queue of ECC events, and the errors that the kernel counts.
#include "platform/linux/device/ecc_events.h"

#include "faulty_file_system.h"
#include "platform/linux/device/linux_system_controls.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

constexpr const char* kQueue = "/var/lib/tavrel/ecc-events/";
constexpr const char* kController = "/sys/devices/system/edac/mc/mc0/";

struct EccEventsTest : testing::Test, DeviceServices {
  EccEventsTest() {
    count("ce_count", 0);  // used instead of the machine's own
    write("/sys/devices/system/edac/mc/mc0x/ce_count", "9\n");
  }
  void count(const char* file, std::uint64_t errors) const {
    write(std::string(kController) + file, std::to_string(errors) + "\n");
  }
  void event(const std::string& name, char identifier) const {
    write(kQueue + name, identifier + std::string(kEccEventBytes - 1, '\0'));
  }
  EccEvents openEvents(EccEvents::Mode mode = EccEvents::Mode::Consume) {
    return {root, files, coding, log, mode};
  }
  std::vector<std::string> queued() { return *files.list(root.path(kQueue)); }
};

/// Everything up to the end: error numbers, and events as "identifier: registers".
std::string all(EccEvents& events) {
  std::string text;
  for (int reads = 0; reads < 20; ++reads) {
    std::array<std::byte, kEccEventBytes> buffer{};
    const auto result = events.next(buffer);
    if (result.errorNumber == ENOENT) return text;
    if (result.errorNumber == 0) events.filed();
    EXPECT_EQ(result.length, result.errorNumber == 0 ? kEccEventBytes : 0);
    text += result.errorNumber == 0 ? format("%d:", std::to_integer<int>(buffer[0]))
                                    : format("errno %d", result.errorNumber);
    for (std::size_t i = 0; i < std::to_integer<std::size_t>(buffer[1]); ++i)
      text += " " + std::to_string(loadLittle64(buffer, 8 + 8 * i).value());
    text += "; ";
  }
  return text + "no end";
}

TEST_F(EccEventsTest, AreReadInOrderAndOnce) {
  event("02.event", 2);
  event("10.event", 3);
  event("01.event", 1);
  write(std::string(kQueue) + "015.errno", "16\n");
  write(std::string(kQueue) + "03.event", "short");
  write(std::string(kQueue) + "04.errno", "4096");
  write(std::string(kQueue) + "notes", "kept");
  const auto before = queued();

  auto peek = openEvents(EccEvents::Mode::Peek);
  EXPECT_EQ(all(peek), "1:; errno 16; 2:; 3:; ");
  EXPECT_EQ(all(peek), "");
  EXPECT_EQ(queued(), before);

  const auto lines = [path = root.path(kQueue)](const std::string& outcome) {
    const std::string what = ": it is neither an event of 72 bytes nor an error number; " + outcome;
    return Lines{path + "03.event" + what, path + "04.errno" + what};
  };
  EXPECT_EQ(log.lines, lines("it would be set aside"));

  log.lines.clear();
  {
    auto queue = openEvents();
    LinuxSystemControls controls(root, files, coding, log, queue);
    std::array<std::byte, kEccEventBytes + 8> buffer{};
    EXPECT_EQ(controls.read("kern.next_ecc_event", MutableByteSpan(buffer).first(71)).errorNumber,
              ENOMEM);
    EXPECT_EQ(controls.read("kern.next_ecc_event", buffer).errorNumber, 0);
    EXPECT_EQ(buffer[0], std::byte{1});
    EXPECT_EQ(queued().front(), "01.event");
    queue.filed();
    EXPECT_EQ(queued().front(), "015.errno");
  }
  auto events = openEvents();
  EXPECT_EQ(all(events), "errno 16; 2:; 3:; ");
  EXPECT_EQ(queued(), (Lines{"03.event.unusable", "04.errno.unusable", "notes"}));
  EXPECT_EQ(log.lines, lines("it is set aside"));
  event("00.event", 7);  // arrives during the reader's lifetime
  EXPECT_EQ(all(events), "7:; ");
  write(std::string(kQueue) + "05.event", "short");
  write(std::string(kQueue) + "05.event.unusable/in", "the way");
  EXPECT_EQ(all(events), "");
  EXPECT_TRUE(log.lines.back().ends_with("05.event.unusable: Is a directory"));
}

// Ten events per run, and none after one that was not filed; the rest waits for the next run.
TEST_F(EccEventsTest, LeaveTheQueueWhenTheyAreFiled) {
  for (char i = 0; i < 12; ++i)
    event(static_cast<char>('a' + i) + std::string(".event"), i);
  auto peek = openEvents(EccEvents::Mode::Peek);
  EXPECT_EQ(all(peek), "0:; 1:; 2:; 3:; 4:; 5:; 6:; 7:; 8:; 9:; errno 16; 10:; 11:; ");
  auto events = openEvents();
  auto others = openEvents();
  std::array<std::byte, kEccEventBytes> event{};
  for (int run = 0; run < 2; ++run) {
    EXPECT_EQ(events.next(event).errorNumber, 0);
    EXPECT_EQ(events.next(event).errorNumber, EBUSY);
  }
  EXPECT_EQ(queued().size(), 12U);
  EXPECT_EQ(all(events), "0:; 1:; 2:; 3:; 4:; 5:; 6:; 7:; 8:; 9:; errno 16; 10:; 11:; ");
  EXPECT_EQ(all(others), "") << "the folder is free again";
  EXPECT_TRUE(log.lines.empty());
}

TEST_F(EccEventsTest, PublishWhatTheKernelHasCountedOnce) {
  count("ce_count", 5);
  count("ue_count", 1);
  event("x.event", 9);
  event("a.event", 8);

  auto peek = openEvents(EccEvents::Mode::Peek);
  EXPECT_EQ(all(peek), "8:; 1: 0 5 5; 2: 0 1 1; 9:; ");
  EXPECT_EQ(queued().size(), 2U);
  EXPECT_FALSE(FileSystem::status(root.path("/var/lib/tavrel/edac-counters.plist")));

  auto first = openEvents();
  EXPECT_EQ(all(first), "8:; 1: 0 5 5; 2: 0 1 1; 9:; ");
  EXPECT_EQ(all(first), "");
  count("ce_count", 7);
  write(std::string(kController) + "ue_count", "?");  // unreadable just this once
  EXPECT_EQ(all(first), "1: 0 2 7; ");
  count("ue_count", 1);
  auto second = openEvents();
  EXPECT_EQ(all(second), "");
  count("ce_count", 3);  // the machine has started again
  EXPECT_EQ(all(second), "1: 0 3 3; ");
  EXPECT_TRUE(log.lines.empty());
}

// An error whose count is not stored is counted again in the next look.
TEST_F(EccEventsTest, ThatCannotBeCountedAreTakenBack) {
  const std::string counters = "/var/lib/tavrel/edac-counters.plist";
  count("ce_count", 5);
  write(counters + "/in", "the way");
  auto events = openEvents();
  EXPECT_EQ(all(events), "");
  EXPECT_EQ(queued(), Lines{});
  EXPECT_EQ(log.lines[2], "cannot put in place " + root.path(counters) + ": Is a directory");
  fs::remove_all(root.path(counters));
  EXPECT_EQ(all(events), "1: 0 5 5; ");
}

TEST_F(EccEventsTest, ArePublishedByOneOfTwoProcesses) {
  count("ce_count", 5);
  std::string others;
  MeddlingFiles system;
  system.part = "ecc-events/.";
  system.meddle = [&] {
    auto faster = openEvents();
    others = all(faster);
  };
  EccEvents events(root, system, coding, log, EccEvents::Mode::Consume);
  EXPECT_EQ(all(events), "");
  EXPECT_EQ(others, "1: 0 5 5; ");
}

TEST_F(EccEventsTest, AreKeptApartByBoots) {
  const auto look = [&](const std::string& boot, std::uint64_t corrected, const char* uncorrected) {
    write("/proc/sys/kernel/random/boot_id", boot + "-0000-4000-8000-000000000000\n");
    count("ce_count", corrected);
    write(std::string(kController) + "ue_count", uncorrected);
    event("a.event", 8);
    auto events = openEvents();
    std::array<std::byte, kEccEventBytes> first{};
    EXPECT_EQ(events.next(first).errorNumber, 0);
    EXPECT_EQ(first[0], std::byte{8});
    events.filed();
  };
  // Counters remembered by a version that did not note the boot count for this boot.
  write("/var/lib/tavrel/edac-counters.plist",
        *coding.encodeXml(plist::Dictionary{{"mc0/ce_count", 3}}));
  look("ffffffff", 5, "9");
  look("00000000", 5, "?");
  look("00000000", 7, "9");
  EXPECT_EQ(queued(), (Lines{"edac-mc0-ce_count-0000000001-FFFFFFFF-00000000000000000005.event",
                             "edac-mc0-ce_count-0000000002-00000000-00000000000000000005.event",
                             "edac-mc0-ce_count-0000000002-00000000-00000000000000000007.event",
                             "edac-mc0-ue_count-0000000001-FFFFFFFF-00000000000000000009.event",
                             "edac-mc0-ue_count-0000000002-00000000-00000000000000000009.event"}));
  auto events = openEvents();
  EXPECT_EQ(all(events), "1: 0 2 5; 1: 0 5 5; 1: 0 2 7; 2: 0 9 9; 2: 0 9 9; ");
  EXPECT_TRUE(log.lines.empty());
}

}  // namespace
}  // namespace tavrel
