#include "platform/linux/files/file_system.h"

#include "faulty_file_system.h"
#include "platform/linux/files/property_list_file.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

std::string messageOf(const auto& outcome) {
  return outcome ? "" : outcome.error().message;
}

struct FileSystemTest : testing::Test, DeviceServices {};

TEST_F(FileSystemTest, ReadsRegularFilesOnlyAndUpToTheLimit) {
  const auto at = [&](std::string_view path) { return root.path(path); };
  write("/full", std::string(5000, 'x'));
  fs::create_directory(at("/folder"));
  ASSERT_EQ(mkfifo(at("/fifo").c_str(), 0600), 0);

  EXPECT_EQ(*files.read(at("/full"), 5000), std::string(5000, 'x'));
  EXPECT_EQ(*files.readIfPresent(at("/none"), 10), std::nullopt);

  const std::pair<std::string_view, std::string_view> kRefused[] = {
      {"/full", ": it has more than 4999 bytes; move it away"},
      {"/folder", ": it is a folder; move it away"},
      {"/fifo", ": it is not a regular file; move it away"}};
  for (const auto& [path, reason] : kRefused) {
    EXPECT_EQ(messageOf(files.read(at(path), 4999)),
              "cannot use " + at(path) + std::string(reason));
  }
  EXPECT_EQ(messageOf(files.read(at("/none"), 1)),
            "cannot read " + at("/none") + ": No such file or directory");
  EXPECT_EQ(messageOf(files.read("/proc/sys/kernel/ostype", 5)),
            "cannot use /proc/sys/kernel/ostype: it has more than 5 bytes; move it away");
}

TEST_F(FileSystemTest, ReplacesWholeFilesAndKeepsTheirMode) {
  const std::string path = root.path("/a/b/file");
  ASSERT_TRUE(files.replace(path, asBytes("one"), 0640));
  EXPECT_EQ(FileSystem::status(path)->st_mode & 0777U, 0640U);
  const uid_t owner = geteuid() == 0 ? 1 : geteuid();
  ASSERT_EQ(chown(path.c_str(), owner, getegid()) + chmod(path.c_str(), 0604), 0);
  ASSERT_TRUE(files.replace(path, asBytes("two"), 0640));
  EXPECT_EQ(FileSystem::status(path)->st_mode & 0777U, 0600U) << "0640 gives others nothing";
  EXPECT_EQ(FileSystem::status(path)->st_uid, owner);
  {
    auto abandoned = files.create(path, 0640);
    ASSERT_TRUE(abandoned);
    ASSERT_TRUE(abandoned->write(asBytes("three")));
  }
  EXPECT_EQ(*files.read(path, 10), "two");
  EXPECT_EQ(std::distance(fs::directory_iterator(root.path("/a/b")), {}), 1);

  const std::string link = root.path("/link");
  fs::create_directory_symlink(root.path("/a"), link);
  EXPECT_EQ(messageOf(files.makePrivateFolder(link)),
            "cannot use the folder " + link + ": Not a directory");
  const std::string folder = root.path("/a");
  EXPECT_EQ(messageOf(files.replace(folder, asBytes("x"), 0644)),
            "cannot put in place " + folder + ": Is a directory");
}

TEST_F(FileSystemTest, RemovesTemporaryFilesOnceTheyAreOld) {
  const auto now = fs::file_time_type::clock::now();
  const std::tuple<const char*, int, bool> kFiles[] = {
      {"/d/.tavrel-0000000000000001.tmp", 25, false},
      {"/d/.tavrel-0000000000000002.tmp", 23, true},
      {"/d/.tavrel-0000000000000003.tmp", -25, false},  // the clock was set back
      {"/d/tavrel-0000000000000005.tmp", 25, true}};
  for (const auto& [name, age, stays] : kFiles) {
    write(name, "x");
    fs::last_write_time(root.path(name), now - std::chrono::hours(age));
  }
  ASSERT_TRUE(files.replace(root.path("/d/file"), asBytes("x"), 0644));
  for (const auto& [name, age, stays] : kFiles)
    EXPECT_EQ(fs::exists(root.path(name)), stays) << name;
}

TEST_F(FileSystemTest, SaysWhySettingsAreNotTrusted) {
  write("/settings", "");
  const std::string path = root.path("/settings");
  const std::string writable =
      "users other than root may write it: make root its owner and set mode 0644";
  for (const auto& [owner, mode, reason] : {std::tuple(geteuid(), 0644, std::string()),
                                            {geteuid(), 0620, writable},
                                            {geteuid(), 0602, writable},
                                            {geteuid() + 1, 0600, writable}}) {
    if (chown(path.c_str(), owner, getegid()) != 0) continue;  // not root
    fs::permissions(path, fs::perms(mode));
    EXPECT_EQ(reasonToDistrust(path), reason) << owner << ' ' << mode;
  }
  EXPECT_EQ(reasonToDistrust(root.path("/missing")),
            "its owner is unknown: No such file or directory");
}

TEST_F(FileSystemTest, AppendsWholeLines) {
  const std::string path = root.path("/logs/lines");
  const std::string zeros(5000, '\0');  // more than a block
  for (const std::string& torn : {std::string(), std::string("tw"), zeros, zeros + '\n',
                                  '\n' + zeros + "\n\n" + zeros, zeros + "\ntw" + zeros}) {
    for (const std::string whole : {"", "one\n", "\1\n"}) {
      write("/logs/lines", whole + torn);
      auto file = files.openToAppend(path, 0640);
      ASSERT_TRUE(file && file->append(asBytes("2\n"), 100));
      EXPECT_EQ(*files.read(path, 20'000), whole + "2\n");
    }
  }
  write("/logs/lines", "one\n");
  auto file = files.openToAppend(path, 0640);
  ASSERT_TRUE(file && file->append(asBytes("three\n"), 100) && file->append(asBytes("4\n"), 100));
  EXPECT_EQ(messageOf(file->append(asBytes("five\n"), 16)),
            "cannot append to " + path + ": it would exceed its limit of 16 bytes; move it away");
  ASSERT_TRUE(file->append(asBytes("5\n"), 14));
  file = Error{"released"};

  FaultyFileSystem faulty(root.path("/"), FaultyFileSystem::Fault::Failure, 2);
  auto full = faulty.openToAppend(path, 0640);
  EXPECT_EQ(messageOf(full->append(asBytes("six\n"), 100)),
            "cannot write " + path + ": No space left on device; free some space");
  EXPECT_TRUE(full->append(asBytes("seven\n"), 100));
  EXPECT_EQ(*files.read(path, 100), "one\nthree\n4\n5\nseven\n");
}

}  // namespace
}  // namespace tavrel
