// Files that other users, packages and the kernel write: desktop entries, package lists,
// os-release, locales, counters of notifications, memory errors, the stat of a process whose name
// may be anything. Resulting names are those of files and fields, events have their fixed size, and
// a counter that was posted has grown.
//
// Input: a byte that chooses the reader, then up to three contents separated by 0xFF.
#include <array>

#include "memory_tree.h"
#include "platform/linux/device/desktop_entries.h"
#include "platform/linux/device/ecc_events.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/device/package_database.h"
#include "platform/linux/files/process_stat.h"
#include "platform/linux/locale/linux_locale.h"
#include "platform/linux/service/file_notifications.h"
#include "platform/plist/coding.h"
#include "support.h"

using namespace tavrel;
using fuzz::require;

namespace {

void readApplications(fuzz::Tree& tree, fuzz::Input& input) {
  fuzz::SilentLog log;
  tree.write("/home/u/.local/share/applications/a.desktop", input.part());
  tree.write("/usr/share/applications/b/c.desktop", input.part());
  std::size_t seen = 0;
  enumerateDesktopEntries(tree.root, log, [&](const PWBundleProxy& bundle) {
    require(++seen <= 2 &&
            (bundle.identifier() == "a.desktop" || bundle.identifier() == "b-c.desktop"));
  });
}

void readPackages(fuzz::Tree& tree, fuzz::Input& input) {
  fuzz::SilentLog log;
  tree.write("/var/lib/dpkg/status", input.part());
  tree.write("/var/lib/apt/extended_states", input.part());
  std::size_t seen = 0;
  const std::size_t count = enumeratePackages(tree.root, log, [&](const PWBundleProxy& bundle) {
    ++seen;
    require(bundle.identifier().find(':') != std::string::npos &&
            bundle.identifier().find('\n') == std::string::npos);
  });
  require(count == seen);
}

void readVersion(fuzz::Tree& tree, fuzz::Input& input) {
  fuzz::SilentLog log;
  FileSystem files;
  plist::PlistCoding coding;
  const std::string text = input.part();
  tree.write("/etc/os-release", text);
  LinuxSystemVersion version(tree.root, files, coding, log);
  for (const plist::Entry& entry : version.systemVersionDictionary())
    require(entry.value.string().has_value());
  const auto name = osReleaseValue(text, "NAME");
  require(!name || name->size() < text.size());
}

void readLocale(fuzz::Tree& tree, fuzz::Input& input) {
  fuzz::SilentLog log;
  tree.write("/etc/locale.conf", input.part());
  tree.write("/etc/locale.gen", input.part());
  const std::string listed = input.part();
  if (!listed.empty()) tree.write("/etc/tavrel/languages", listed);
  LinuxLocale locale(tree.root, log);
  const auto preferred = locale.preferredLanguages();
  const auto available = locale.systemLanguages();
  for (const std::string& match : locale.matchLocalizations(available, preferred))
    require(std::ranges::find(available, match) != available.end());
  const auto country = locale.countryCode();
  require(!country || country->size() == 2);
}

void readNotification(fuzz::Tree& tree, fuzz::Input& input) {
  fuzz::SilentLog log;
  FileNotifications notifications(tree.root, log);
  tree.write("/run/tavrel/notifications/name", input.part());
  const auto before = notifications.count("name");
  require(before || !before.error().message.empty());
  const auto posted = notifications.tryPost("name");
  require(posted && (!before || *posted == *before + 1));
  const auto after = notifications.count("name");
  require(after && *after == *posted);
}

void readMemoryErrors(fuzz::Tree& tree, fuzz::Input& input) {
  fuzz::SilentLog log;
  FileSystem files;
  plist::PlistCoding coding;
  const std::string controller = "/sys/devices/system/edac/mc/mc0/";
  tree.write(controller + "ce_count", input.part());
  tree.write("/var/lib/tavrel/edac-counters.plist", input.part());
  tree.write("/var/lib/tavrel/ecc-events/x.event", input.text());
  tree.write("/var/lib/tavrel/ecc-events/y.errno", input.text());
  EccEvents events(tree.root, files, coding, log, EccEvents::Mode::Consume);
  std::array<std::byte, kEccEventBytes> buffer{};
  // Read all events; after the last one, "none left" must come twice.
  int ends = 0;
  for (int i = 0; i < 8 && ends < 3; ++i) {
    const auto result = events.next(buffer);
    require(result.errorNumber != 0 || result.length == kEccEventBytes);
    if (result.errorNumber != 0) ++ends;
    events.filed();
  }
  require(ends >= 2);
}

// Whatever the name is, the number after it must be the one that the kernel wrote.
void readProcess(fuzz::Input& input) {
  const std::string whole(input.text());
  startInStat(whole);
  const std::string name = whole.substr(0, 15);
  std::string stat = "7 (" + name + ") S";
  for (int field = 4; field <= 52; ++field)
    stat += ' ' + std::to_string(field * 10);
  require(startInStat(stat) == 220U);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  fuzz::Tree tree;
  switch (input.byte() % 7) {
    case 0:
      readApplications(tree, input);
      break;
    case 1:
      readPackages(tree, input);
      break;
    case 2:
      readVersion(tree, input);
      break;
    case 3:
      readLocale(tree, input);
      break;
    case 4:
      readNotification(tree, input);
      break;
    case 5:
      readMemoryErrors(tree, input);
      break;
    default:
      readProcess(input);
  }
  return 0;
}
