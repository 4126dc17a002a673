#include <chrono>
#include <gtest/gtest.h>
#include <set>
#include <sqlite3.h>
#include <sstream>

#include "base/format.h"
#include "base/text.h"
#include "fleet/fleet_tool.h"
#include "fleet/loading/reading_threads.h"
#include "fleet/sources/sources.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/file_system.h"
#include "sample_log.h"
#include "tests/devices/temporary_root.h"

namespace tavrel::fleet {
namespace {

using namespace std::chrono_literals;

constexpr const char* kMetadata =
    "<plist version=\"1.0\"><dict><key>LogType</key><string>193</string><key>OSVersion</key>"
    "<string>Pellio 4.2 (16R349)</string><key>Options</key><dict><key>previous_os_version</key>"
    "<string>Pellio 4.1 (16Q1)</string><key>ConfigNumber</key><string>CFG-7</string></dict></dict>"
    "</plist>";
constexpr const char* kOtherMetadata =
    "<plist version=\"1.0\"><dict><key>LogType</key><string>165</string></dict></plist>";

struct Outcome {
  int status;
  std::string out, error;
};

class LoadTest : public ::testing::Test {
 protected:
  std::string at(const std::string& path) const { return device_.root.path("/" + path); }
  void write(const std::string& path, const std::string& content) const {
    device_.write("/" + path, content);
  }

  /// Runs a shell's command in the folder of the files.
  void shell(const std::string& command) const {
    ASSERT_EQ(std::system(("cd " + at("") + " && " + command).c_str()), 0);
  }

  Outcome run(std::vector<std::string> words) const {
    words.insert(words.begin(), {"--database", at("fleet.db"), "load"});
    std::istringstream in;
    std::ostringstream out, error;
    const int status = runFleet(words, {in, out, error});
    return {status, out.str(), withoutFolder(error.str())};
  }

  std::string withoutFolder(std::string text) const {
    const std::string folder = device_.root.path("/");
    for (std::size_t found = 0; (found = text.find(folder)) != std::string::npos;)
      text.erase(found, folder.size());
    return text;
  }

  /// The starts of each log, with the versions and configuration of its metadata.
  std::multiset<std::string> versions() const {
    sqlite3* database = nullptr;
    EXPECT_EQ(sqlite3_open(at("fleet.db").c_str(), &database), SQLITE_OK);
    std::multiset<std::string> found;
    const auto take = [](void* rows, int count, char** texts, char**) {
      std::string row;
      for (int i = 0; i < count; ++i)
        row.append(i == 0 ? "" : "|").append(texts[i] ? texts[i] : "");
      static_cast<std::multiset<std::string>*>(rows)->insert(row);
      return 0;
    };
    constexpr const char* kStatement =
        "SELECT s.value, os_version, previous_os_version, config_number FROM logs l JOIN "
        "scalars s USING (log) WHERE s.key = 'app.starts'";
    EXPECT_EQ(sqlite3_exec(database, kStatement, take, &found, nullptr), SQLITE_OK)
        << sqlite3_errmsg(database);
    sqlite3_close(database);
    return found;
  }

  TemporaryRoot device_;
};

TEST_F(LoadTest, TakesAnOutbox) {
  write("outbox/log-tallied-20261127T180218Z-5f0c9a1e.log", sampleLog(1));
  write("outbox/log-tallied-20261127T180218Z-5f0c9a1e.metadata.plist", kMetadata);
  write("outbox/log-tallied-20261128T180218Z-00000000.log", sampleLog(2));
  write("outbox/StorageStatus-20261127T180218Z-5f0c9a1e.log", "flash");
  write("outbox/StorageStatus-20261127T180218Z-5f0c9a1e.metadata.plist", kOtherMetadata);
  write("outbox/StorageStatus-20261128T180218Z-5f0c9a1e.log", "flash without metadata");
  write("outbox/.tavrel-0123456789012345.tmp", "unfinished");
  const Outcome first = run({at("outbox")});
  EXPECT_EQ(first.error, "");
  EXPECT_EQ(first.out, "2 loaded, 0 known, 0 refused; 2 of another kind; 1 without metadata\n");
  EXPECT_EQ(first.status, 0);
  EXPECT_EQ(versions(),
            (std::multiset<std::string>{"1|Pellio 4.2 (16R349)|Pellio 4.1 (16Q1)|CFG-7", "2|||"}));
  // The same logs under other names, and in another encoding.
  write("again/a.log.gz", gzipped(sampleLog(1)));
  write("again/b.plist", sampleLog(2));
  EXPECT_EQ(run({at("again"), at("outbox"), "--json"}).out,
            "{\n  \"format_version\": 1,\n  \"loaded\": 0,\n  \"known\": 4,\n  \"refused\": 0,\n"
            "  \"others\": 2,\n  \"left_to_next_load\": 0,\n  \"without_metadata\": 0\n}\n");
}

TEST_F(LoadTest, TakesMetadataOnlyFromBesideTheLog) {
  write("a/x.d/mylog", sampleLog(1));
  write("a/x.metadata.plist", kMetadata);
  write("a/x.d/other", sampleLog(2));
  write("a/x.d/other.metadata.plist", kMetadata);
  EXPECT_EQ(run({at("a/x.d/mylog"), at("a/x.d/other")}).status, 0);
  EXPECT_EQ(versions(),
            (std::multiset<std::string>{"1|||", "2|Pellio 4.2 (16R349)|Pellio 4.1 (16Q1)|CFG-7"}));
}

TEST_F(LoadTest, TakesAServersUploads) {
  const std::string name = "log-tallied-20261127T180218Z-5f0c9a1e.log";
  write("srv/device-7/" + name + ".gz", gzipped(sampleLog(7)));
  write("srv/device-8/" + name + ".gz", gzipped(sampleLog(8)));
  write("srv/device-9/" + name + ".gz", gzipped(sampleLog(9)));
  write("srv/device-9/report-20261127T180218Z-5f0c9a1e.log.gz", gzipped("of another kind"));
  write("srv/lost/" + name + ".gz", gzipped(sampleLog(10)));
  write("srv/lost+found/#12.log", "nonsense");
  write("srv/.unfinished/0000000001", "half");
  const auto line = [&](const char* device, const char* status, const char* os,
                        const char* options) {
    return format(
        "{\"time\":\"t\",\"device\":\"%s\",\"log\":\"%s\",\"status\":%s,\"type\":\"193\","
        "\"name\":\"log-tallied\",\"os_version\":\"%s\",\"filed\":\"\",\"options\":\"%s\"}\n",
        device, name, status, os, options);
  };
  write("old.log.gz", gzipped(line("device-7", "201", "Pellio 4.1", "")));
  write("lines.log", line("device-7", "204", "Pell%C3%ADo 4.2",
                          "previous_os_version=4.1%26%3D&ConfigNumber=%43") +
                         line("device-8", "201", "Pellio 5", "previous_os_version=<unknown>") +
                         "{\"half\":\n" + line("device-9", "413", "Pellio 6", ""));
  const auto load = [&] {
    return run({at("srv"), "--metadata", at("old.log.gz"), "--metadata", at("lines.log")});
  };
  const Outcome outcome = load();
  EXPECT_EQ(outcome.error,
            "tavrel-fleet: lines.log: 2 lines ignored: they report no successful upload\n");
  EXPECT_EQ(outcome.out,
            "2 loaded, 0 known, 0 refused; 1 of another kind; 2 left to the next load\n");
  const auto now = std::filesystem::file_time_type::clock::now();
  std::filesystem::last_write_time(at("srv/device-9/" + name + ".gz"), now - 90s);
  std::filesystem::last_write_time(at("srv/lost/" + name + ".gz"), now + 1h);
  EXPECT_EQ(load().out, "2 loaded, 2 known, 0 refused; 1 of another kind; 2 without metadata\n");
  EXPECT_EQ(versions(),
            (std::multiset<std::string>{"7|Pellío 4.2|4.1&=|C", "8|Pellio 5||", "9|||", "10|||"}));
  std::filesystem::create_directory_symlink("srv/device-7", at("current"));
  EXPECT_EQ(run({at("current"), "--metadata", at("lines.log")}).out,
            "0 loaded, 1 known, 0 refused\n");
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(at("srv/device-7"));
  for (const std::string& path : {std::string("."), std::string("./"), name + ".gz"})
    EXPECT_EQ(run({path, "--metadata", at("lines.log")}).out, "0 loaded, 1 known, 0 refused\n");
  std::filesystem::current_path(before);
}

TEST_F(LoadTest, TakesArchives) {
  write("in/d/a.log", sampleLog(1));
  write("in/d/a.metadata.plist", kMetadata);
  write("in/d/b.log.gz", gzipped(sampleLog(2)));
  write("in/d/c.log", sampleLog(3).substr(0, 500));
  write("in/d/e.log", sampleLog(4));
  write("in/d/e.metadata.plist", "<plist>");
  std::filesystem::create_symlink("a.log", at("in/d/link.log"));
  shell("tar -cf all.tar -C in d && tar -czf all.tgz -C in d && head -c 2000 all.tar > cut.tar");
  shell(
      "cd in && tar -cf a.tar d/a.* && tar -cf b.tar --exclude='a.*' d && cat ?.tar > ../all.tar");
  const Outcome alone = run({at("in/d/e.log")});
  EXPECT_EQ(alone.out, "0 loaded, 0 known, 1 refused\n");
  EXPECT_NE(alone.error.find("e.log: its metadata: "), std::string::npos) << alone.error;
  const Outcome outcome = run({at("all.tar")});
  EXPECT_EQ(outcome.out, "2 loaded, 0 known, 2 refused; 1 without metadata\n");
  EXPECT_EQ(outcome.status, 1);
  EXPECT_NE(outcome.error.find("refused: all.tar: d/e.log: its metadata: "), std::string::npos);
  EXPECT_NE(outcome.error.find("skipped: all.tar: d/link.log: is not a regular file\n"),
            std::string::npos);
  EXPECT_NE(outcome.error.find("refused: all.tar: d/c.log: is cut short: the property list does "
                               "not end within its 500 bytes\n"),
            std::string::npos);
  EXPECT_EQ(versions(),
            (std::multiset<std::string>{"1|Pellio 4.2 (16R349)|Pellio 4.1 (16Q1)|CFG-7", "2|||"}));
  EXPECT_EQ(run({at("all.tgz")}).out, "0 loaded, 2 known, 2 refused\n");
  const Outcome cut = run({at("cut.tar")});
  EXPECT_NE(cut.error.find("refused: cut.tar: the rest cannot be read: "), std::string::npos)
      << cut.error;
  EXPECT_EQ(cut.status, 1);
  write("first.log", sampleLog(5));
  write("first.metadata.plist", kMetadata);
  const std::size_t content = (sampleLog(5).size() + 511) / 512 * 512;
  shell("tar -cf early.tar first.log first.metadata.plist");
  for (const auto& [bytes, reason] :
       {std::pair(512 + content, "its end mark is missing: it may be cut short"),
        std::pair(512 + content + 100, "the rest cannot be read: ")}) {
    shell(format("head -c %zu early.tar | tee e.tar | gzip > e.tgz", bytes));
    for (const std::string name : {"e.tar", "e.tgz"}) {
      const std::string refused = "tavrel-fleet: refused: " + name + ": ";
      const std::string error = run({at(name)}).error;
      EXPECT_TRUE(error.starts_with(refused +
                                    "first.log: its metadata may be in the rest of the archive\n" +
                                    refused + reason))
          << error;
    }
  }
  shell(format("head -c %zu early.tar > e.tar", 512 + content + 512 + 512 + 512));
  EXPECT_EQ(run({at("e.tar")}).out, "1 loaded, 0 known, 0 refused\n") << "half of the end mark";
  // Files of one gigabyte, and of 70 megabytes each, in archives of a few kilobytes.
  shell("truncate -s 1G big.log && tar -cSf bomb.tar big.log");
  shell(
      "for n in 1 2 3; do truncate -s 60M h$n.log; echo >> h$n.log; truncate -s 70M h$n.log; echo "
      ">> h$n.log; done; tar -cSf holes.tar "
      "h?.log");
  for (const std::string name : {"bomb.tar", "holes.tar"}) {
    const std::string error = run({at(name)}).error;
    EXPECT_TRUE(error.ends_with("tavrel-fleet: refused: " + name +
                                ": expands to more than 1000 times its size\n"))
        << error;
  }
  shell(
      "python3 -c 'import tarfile\n"
      "with tarfile.open(\"many.tgz\", \"w:gz\", compresslevel=1, format=tarfile.GNU_FORMAT) as "
      "tar:\n"
      " for i in range(260): tar.addfile(tarfile.TarInfo(\"x\" * 2**19 + "
      "f\"{i}.metadata.plist\"))'");
  EXPECT_EQ(run({at("many.tgz")}).error,
            "tavrel-fleet: refused: many.tgz: its metadata takes more than 134217728 bytes: divide "
            "it into smaller archives\n");
}

TEST_F(LoadTest, SetsAsideWhatItRefuses) {
  write("in/good.log", sampleLog(1));
  write("in/bad.log", "nonsense");
  write("in/b\x1b\n.log", "nonsense");
  write("in/sub/empty.log", "");
  std::filesystem::create_symlink("good.log", at("in/link.log"));
  std::filesystem::create_directory_symlink(at("in"), at("in/sub/loop"));
  ASSERT_EQ(mkfifo(at("in/pipe.log").c_str(), 0600), 0);
  std::filesystem::create_directory(at("in/z"));
  std::map<std::string, ino_t> written;
  for (int time = 0; time < 2; ++time) {
    const Outcome outcome = run({at("in"), "--set-aside", at("in/z/aside")});
    EXPECT_EQ(outcome.error,
              "tavrel-fleet: refused: in/b\\x1b\\n.log: is not a property list\n"
              "tavrel-fleet: refused: in/bad.log: is not a property list\n"
              "tavrel-fleet: skipped: in/link.log: is a symbolic link\n"
              "tavrel-fleet: skipped: in/pipe.log: is not a regular file\n"
              "tavrel-fleet: refused: in/sub/empty.log: is empty\n"
              "tavrel-fleet: skipped: in/sub/loop: is a symbolic link\n");
    EXPECT_EQ(outcome.status, 1);
    for (const auto& file : std::filesystem::directory_iterator(at("in/z/aside"))) {
      const ino_t inode = FileSystem::status(file.path())->st_ino;
      EXPECT_EQ(written.try_emplace(file.path(), inode).first->second, inode) << file.path();
    }
  }
  std::map<std::string, std::string> kept;
  for (const auto& file : std::filesystem::directory_iterator(at("in/z/aside")))
    kept[file.path().filename().string().substr(17)] = withoutFolder(contentOf(file.path()));
  EXPECT_EQ(kept, (std::map<std::string, std::string>{
                      {"b__.log", "nonsense"},
                      {"b__.log.reason", "in/b\\x1b\\n.log: is not a property list\n"},
                      {"bad.log", "nonsense"},
                      {"bad.log.reason", "in/bad.log: is not a property list\n"},
                      {"empty.log.reason", "in/sub/empty.log: is empty\n"}}));
  EXPECT_EQ(contentOf(at("in/bad.log")), "nonsense");
  write("in/z/aside/a.log", "nonsense");
  for (const char* const path : {"in/z/aside", "in/z/aside/a.log"}) {
    const Outcome itself = run({at(path), "--set-aside", at("in/sub/loop/z/aside")});
    EXPECT_EQ(
        itself.error,
        "tavrel-fleet: --set-aside: in/sub/loop/z/aside is loaded itself: name another folder\n");
    EXPECT_EQ(itself.status, 2);
  }
  EXPECT_EQ(run({at("in/sub"), "--set-aside", at("in")}).status, 1);
}

TEST_F(LoadTest, LoadsNothingWhenAPathIsWrong) {
  write("in/good.log", sampleLog(1));
  for (const char* option : {"--whitelist", "--metadata", ""}) {
    std::vector<std::string> arguments = {at("in"), at("none.log"), "--set-aside", at("aside")};
    if (*option != '\0') arguments.insert(arguments.begin() + 1, option);
    const Outcome outcome = run(arguments);
    EXPECT_EQ(outcome.error,
              "tavrel-fleet: cannot read none.log: No such file or directory: check the path\n");
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.status, 1);
  }
  EXPECT_FALSE(std::filesystem::exists(at("fleet.db")));
  EXPECT_FALSE(std::filesystem::exists(at("aside")));
}

TEST_F(LoadTest, TakesOnlyWhatAWhitelistPermits) {
  const auto group = [](const char* scalars) {
    return format(
        "<plist version=\"1.0\"><dict><key>A</key><dict><key>ScalarKeys</key><dict>"
        "<key>app.a&lt;b&amp;c</key><dict/></dict><key>ScalarKeyPrefixes</key>"
        "<dict>%s</dict></dict><key>InternalTesting</key><dict><key>DistributionKeyPrefixes"
        "</key><dict><key>app.</key><dict/></dict></dict></dict></plist>",
        scalars);
  };
  const std::string wide = group("<key>app.st</key><dict/>");
  const std::string narrow = group("<key>app.st</key><true/>");
  const auto logOf = [](const std::string& whitelist, int starts) {
    std::string digest;
    appendHex(digest, LinuxDigest().md5(asBytes(whitelist)));
    return changed(sampleLog(starts), "eb42570d2e2f7addc42403d203dafde4", digest);
  };
  write("wide.plist", wide);
  write("narrow.plist", narrow);
  write("in/1.log", logOf(wide, 1));
  write("in/2.log", logOf(narrow, 2));
  write("in/3.log", sampleLog(3));
  const Outcome outcome =
      run({at("in"), "--whitelist", at("wide.plist"), "--whitelist", at("narrow.plist")});
  EXPECT_EQ(
      outcome.error,
      "tavrel-fleet: refused: in/2.log: BHScalars/app.starts: its whitelist does not "
      "permit the key\n"
      "tavrel-fleet: refused: in/3.log: its whitelist \"eb42570d2e2f7addc42403d203dafde4\" is "
      "not among those given\n");
  EXPECT_EQ(outcome.out, "1 loaded, 0 known, 2 refused; 1 without metadata\n");
  EXPECT_EQ(run({at("in"), "--whitelist", at("in")}).error,
            "tavrel-fleet: whitelist in: is not a regular file\n");
}

TEST_F(LoadTest, HandsOutLargeLogsOneByOne) {
  const std::string large = gzipped(std::string(60U << 20, 'x'));
  for (int i = 0; i < 8; ++i)
    write(format("large/%d.log", i), large);
  const std::string many = gzipped(std::string(30U << 20, 'x'));
  constexpr int kMany = 64;
  for (int i = 0; i < kMany; ++i)
    write(format("many/%d.log", i), many);
  const PermittedKeys all;
  const auto find = [&](const char* folder) {
    return [this, folder](const SourceSink& sink) { visitSources(at(folder), {}, sink); };
  };
  const auto threads = [] {
    return std::distance(std::filesystem::directory_iterator("/proc/self/task"), {});
  };
  const auto before = threads();
  // Later logs may take all the memory before an earlier one is read.
  ReadingThreads crowd(find("many"), all, 8);
  EXPECT_LE(threads(), before + 5);
  for (int i = 0; i < kMany; ++i)
    EXPECT_TRUE(crowd.next());
  EXPECT_FALSE(crowd.next());
  ReadingThreads reading(find("large"), all, 1);
  while (!reading.isMoreRead())
    std::this_thread::yield();
  for (int i = 4; i < 8; ++i)
    std::filesystem::remove(at(format("large/%d.log", i)));
  std::multiset<std::string> reasons;
  while (const auto item = reading.next())
    reasons.insert(item->source.reason);
  EXPECT_EQ(reasons.count("is not a property list"), 4U);
  EXPECT_EQ(reasons.count("cannot be read: No such file or directory"), 4U);
}

TEST_F(LoadTest, SaysHowItIsUsed) {
  EXPECT_EQ(run({}).status, 2);
  EXPECT_EQ(run({"x", "--nonsense"}).error,
            "tavrel-fleet: no option '--nonsense': see 'tavrel-fleet load --help'\n");
}

}  // namespace
}  // namespace tavrel::fleet
