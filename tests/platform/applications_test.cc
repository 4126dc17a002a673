
#include <csignal>
#include <sys/inotify.h>

#include "platform/application_registry.h"
#include "platform/linux/device/linux_applications.h"
#include "platform/linux/files/descriptor.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

class ApplicationsTest : public testing::Test, protected DeviceServices {
 protected:
  /// Each bundle as "identifier type".
  std::vector<std::string> bundles(std::uint32_t kind = kInstalledApplications) {
    std::vector<std::string> found;
    applications.enumerateBundles(kind, [&](const PWBundleProxy& bundle) {
      found.push_back(bundle.identifier() + " " + std::string(bundle.bundleType()));
    });
    return found;
  }
  void writeEntry(std::string_view path, std::string_view keys) {
    write(path, "# menu\n[Desktop Entry]\n" + std::string(keys) + "\n");
  }

  LinuxApplications applications{root, log};
};

TEST_F(ApplicationsTest, CountsInstalledPackagesAndThoseOfTheUser) {
  write("/var/lib/dpkg/status",
        "Package: bash\nEssential: yes\nStatus: install ok installed\nPriority: optional\n"
        "Architecture: amd64\nDescription: shell\n Status: deinstall ok config-files\n .\n\n"
        "Package: dpkg\nStatus: install ok installed\nPriority: required\n"
        "Architecture: amd64\n\n"
        "Package: half\nStatus: install reinstreq half-installed\nArchitecture: amd64\n\n"
        "Status: install ok installed\nArchitecture: amd64\n\n\n"
        "Package: held\nStatus: hold ok installed\nPriority: optional\nArchitecture: all\n\n"
        "Package: helper\nStatus: install ok installed\nArchitecture: all\n\n"
        "Package: lib\nStatus: install ok installed\nArchitecture: amd64\n\n"
        "Package: lib\nStatus: install ok installed\nArchitecture: i386\n\n"
        "Package: ages\nStatus: install ok installed\nArchitecture: i386\n\n"
        "Package: long\nNote: " +
            std::string(3 * limits::kTextLineBytes, 'x') +
            "\nArchitecture: all\nProtected: yes\nStatus: install ok installed");
  write("/var/lib/apt/extended_states",
        "Package: helper\nArchitecture: amd64\nAuto-Installed: 1\n\n"
        "Package: lib\nArchitecture: i386\nAuto-Installed: 1\n\n"
        "Package: ages\nAuto-Installed: 1\n\n"
        "Package: held\nArchitecture: amd64\nAuto-Installed: 0\n");
  EXPECT_EQ(bundles(),
            (Lines{"bash:amd64 System", "dpkg:amd64 System", "held:all User", "helper:all System",
                   "lib:amd64 User", "lib:i386 System", "ages:i386 System", "long:all System"}));
  EXPECT_EQ(bundles(2), Lines{});
  EXPECT_EQ(log.lines, Lines{});
}

TEST_F(ApplicationsTest, FallsBackToDesktopEntries) {
  write("/var/lib/dpkg/status", "Package: gone\nStatus: purge ok not-installed\n");
  writeEntry("/usr/share/applications/editor.desktop",
             "Type = Application \nName=E\n[X]\nHidden=true");
  writeEntry("/usr/share/applications/kde/mail.desktop", "Type=Application\nHidden=false");
  writeEntry("/usr/share/applications/quiet.desktop", "Type=Application\nNoDisplay=true");
  writeEntry("/usr/share/applications/removed.desktop", "Type=Application");
  write("/usr/share/applications/bare.desktop", "Type=Application\n");
  writeEntry("/usr/local/share/applications/tool.desktop", "Type=Application\r");
  writeEntry("/home/ann/.local/share/applications/kde-mail.desktop", "Type=Application");
  writeEntry("/home/ann/.local/share/applications/removed.desktop",
             "Type=Application\nHidden=true");
  writeEntry("/usr/share/applications/huge.desktop",
             "Type=Application\nX=" + std::string(limits::kDesktopEntryBytes, 'x'));
  writeEntry("/elsewhere/share/applications/foreign.desktop", "Type=Application");
  std::string path = "/usr/share/applications";
  std::string prefix;
  for (int depth = 0; depth < limits::kDesktopFolderDepth; ++depth) {
    path += "/d";
    prefix += "d-";
  }
  writeEntry(path + "/deep.desktop", "Type=Application");
  writeEntry(path + "/d\n/deeper.desktop", "Type=Application");
  std::filesystem::create_directory(root.path("/home/eve"));
  std::filesystem::create_directory_symlink(root.path("/elsewhere"), root.path("/home/eve/.local"));
  auto found = bundles();
  std::sort(found.begin(), found.end());
  EXPECT_EQ(found, (Lines{prefix + "deep.desktop System", "editor.desktop System",
                          "kde-mail.desktop User", "tool.desktop User"}));
  EXPECT_EQ(log.lines,
            Lines{"desktop entries nested more than 16 folders deep do not count, as in \"" +
                  root.path(path) + "/d\\n\"; move them up"});
}

TEST_F(ApplicationsTest, SaysWhatCannotBeListed) {
  writeEntry("/usr/share/applications/tool.desktop", "Type=Application");
  const std::string homes = root.path("/home");
  const std::string own = root.path("/usr/local/share/applications");
  std::filesystem::create_directories(root.path("/usr/local/share"));
  for (const std::string& folder : {homes, own})
    std::filesystem::create_symlink(folder, folder);
  EXPECT_EQ(bundles(), Lines{"tool.desktop System"});
  const std::string reason =
      ": Too many levels of symbolic links; not all applications are counted";
  EXPECT_EQ(log.lines, (Lines{"cannot list the homes in " + homes + reason,
                              "cannot list the desktop entries in " + own + reason}));
}

TEST_F(ApplicationsTest, SaysWhatCannotBeRead) {
  EXPECT_EQ(bundles(), Lines{});
  EXPECT_EQ(log.lines, Lines{});
  write("/var/lib/dpkg/status", "Package: a\nStatus: install ok installed\nArchitecture: all\n");
  write("/var/lib/apt/placeholder", "");
  const std::string states = root.path("/var/lib/apt/extended_states");
  ASSERT_EQ(mkfifo(states.c_str(), 0600), 0);
  const Descriptor watch(inotify_init1(IN_NONBLOCK));
  ASSERT_NE(inotify_add_watch(watch.get(), states.c_str(), IN_OPEN), -1);
  EXPECT_EQ(bundles(), Lines{"a:all User"});
  inotify_event opened;
  EXPECT_EQ(read(watch.get(), &opened, sizeof(opened)), -1) << "opening a device may have effects";
  EXPECT_EQ(log.lines, Lines{"cannot read " + states +
                             ": Invalid argument; packages that were installed "
                             "automatically count as installed by the user"});
  const std::string packages = root.path("/var/lib/dpkg/status");
  std::filesystem::rename(states, packages);
  writeEntry("/usr/share/applications/tool.desktop", "Type=Application");
  EXPECT_EQ(bundles(), Lines{"tool.desktop System"});
  EXPECT_EQ(log.lines.back(),
            "cannot read " + packages + ": Invalid argument; desktop entries are counted instead");

  // A user who ignores the request to give up a lease keeps nobody waiting.
  const std::string tool = root.path("/usr/share/applications/tool.desktop");
  const Descriptor held(open(tool.c_str(), O_WRONLY | O_CLOEXEC));
  ASSERT_NE(signal(SIGIO, SIG_IGN), SIG_ERR);
  if (fcntl(held.get(), F_SETLEASE, F_WRLCK) != 0) GTEST_SKIP() << "no leases here";
  EXPECT_EQ(bundles(), Lines{}) << "waiting ends the lease after 45 seconds";
  EXPECT_EQ(log.lines.back(), "cannot read \"" + tool +
                                  "\": Resource temporarily unavailable; not all applications are "
                                  "counted");
}

}  // namespace
}  // namespace tavrel
