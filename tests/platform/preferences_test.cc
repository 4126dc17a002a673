#include <cmath>

#include "faulty_file_system.h"
#include "platform/linux/logs/json_line.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

constexpr std::string_view kDomain = "com.example.domain";
constexpr std::string_view kFile = "/var/mobile/Library/Preferences/com.example.domain.plist";

/// One process's view of the device's preferences.
struct Process : ProcessServices {
  using ProcessServices::ProcessServices;

  std::string get(std::string_view key) {
    return textOf(preferences.ZTXPreferencesGetValue(key, kDomain));
  }
  void set(std::string_view key, const plist::Value& value) {
    preferences.ZTXPreferencesSetValue(key, value, kDomain);
  }
  bool synchronize() { return preferences.ZTXPreferencesSynchronize(kDomain); }
  std::string all() {
    std::string text;
    appendJson(text, preferences.values(kDomain));
    return text;
  }
};

struct PreferencesTest : testing::Test, TemporaryRoot {};

TEST_F(PreferencesTest, AreSeenAtOnceHereAndElsewhereOnceSynchronised) {
  Process here(root), there(root);
  EXPECT_EQ(here.get("a"), "(null)");
  const plist::Array list{1, 2};
  here.set("a", list);
  plist::Array(list).append(3);  // only changes the caller's copies
  here.preferences.ZTXPreferencesGetValue("a", kDomain).array().append(4);
  EXPECT_EQ(here.get("a"), "[1, 2]");
  EXPECT_EQ(there.get("a"), "(null)");
  EXPECT_TRUE(here.synchronize());
  EXPECT_EQ(there.get("a"), "(null)") << "until it takes in what others wrote";
  EXPECT_TRUE(there.synchronize());
  EXPECT_EQ(there.get("a"), "[1, 2]");

  // Both write, and each keeps the other's keys; a removal is a change like any other.
  here.set("b", true);
  there.set("c", "text");
  there.set("a", {});
  EXPECT_TRUE(here.synchronize());
  EXPECT_TRUE(there.synchronize());
  EXPECT_EQ(there.all(), R"({"b":true,"c":"text"})");

  Process(root).set("d", std::int64_t{-5});
  EXPECT_EQ(Process(root).get("d"), "-5");
  EXPECT_TRUE(here.log.lines.empty() && there.log.lines.empty());
}

TEST_F(PreferencesTest, AFileThatIsNoPropertyListIsSetAside) {
  for (const std::string content : {"", "garbage", "<plist version=\"1.0\"><array/></plist>"}) {
    const TemporaryRoot device;
    device.write(kFile, content);
    Process process(device.root);
    EXPECT_EQ(process.get("a") + process.get("b"), "(null)(null)");
    ASSERT_EQ(process.log.lines.size(), 1U) << "told once";
    EXPECT_EQ(process.log.lines[0].find("cannot read preferences " + device.root.path(kFile)), 0U);
    process.set("a", 1);
    EXPECT_TRUE(process.synchronize());
    EXPECT_EQ(process.all(), R"({"a":1})");
    std::string aside;
    for (const auto& entry : fs::directory_iterator(device.root.path(kFile.substr(0, 31)))) {
      if (entry.path().extension().string().starts_with(".corrupt-")) aside = entry.path();
    }
    EXPECT_EQ(contentOf(aside), content);
    device.write("/var/mobile/Library/Preferences/com.example.domain-b.plist", "");
    EXPECT_EQ(*process.preferences.domains(),
              (std::vector<std::string>{"com.example.domain", "com.example.domain-b"}));
  }
}

TEST_F(PreferencesTest, WhatCannotBeWrittenIsKeptAndToldOnce) {
  fs::create_directories(root.path(kFile));  // a folder where the file should be
  Process process(root);
  process.set("a", 1);
  EXPECT_FALSE(process.synchronize());
  EXPECT_FALSE(process.synchronize());
  EXPECT_EQ(process.log.lines,
            Lines{"cannot use " + root.path(kFile) + ": it is a folder; move it away"});
  EXPECT_EQ(process.get("a"), "1");
  fs::remove(root.path(kFile));
  EXPECT_TRUE(process.synchronize());

  // One value that cannot be encoded does not hold up the others.
  process.set("bad", plist::Date::sinceEpoch(std::nan("")));
  process.set("good", 2);
  EXPECT_TRUE(process.synchronize());
  EXPECT_EQ(process.log.lines.size(), 2U);
  EXPECT_EQ(process.all(), R"({"a":1,"good":2})");

  // Nor does one that is too large, nor several that are so together: the largest goes.
  process.set("good", std::string(1U << 20, 'x'));
  for (std::size_t i = 0; i < 9; ++i)
    process.set("large" + std::to_string(i), std::string((1000 + i) << 10, 'x'));
  process.set("gate", 20783);
  EXPECT_TRUE(process.synchronize());
  EXPECT_EQ(process.log.lines.size(), 4U);
  EXPECT_TRUE(process.log.says(
      "cannot write preference \"large8\" of domain com.example.domain: the file "));
  Process later(root);
  EXPECT_EQ(later.get("gate") + later.get("good"), "207832");
  EXPECT_EQ(later.get("large7").size(), 1007U << 10);
  EXPECT_EQ(later.get("large8"), "(null)");
}

TEST_F(PreferencesTest, ADomainThatCannotNameAFileIsRefused) {
  Process process(root);
  for (const std::string name : {"", ".hidden", "../../etc/passwd", "a/b", "line\nend"}) {
    process.preferences.ZTXPreferencesSetValue("k", 1, name);
    EXPECT_FALSE(process.preferences.ZTXPreferencesSynchronize(name));
  }
  ASSERT_EQ(process.log.lines.size(), 5U);
  EXPECT_EQ(process.log.lines[1],
            "cannot set preference \"k\": \".hidden\" is not the name of a domain; use 1 to 200 "
            "characters, no slash or control character, and no dot in front");
  EXPECT_TRUE(fs::is_empty(root.path("/")));
  for (const std::size_t excess : {0U, 1U}) {
    const std::string name(limits::kPreferenceDomainBytes + excess, 'd');
    EXPECT_EQ(FilePreferences::isValidDomain(name), excess == 0);
  }
}

TEST_F(PreferencesTest, AreOldOrNewAfterEveryFault) {
  const auto makeSteps = [](Process& process) {
    int done = 0;
    process.set("a", "new");
    if (process.synchronize()) done = 1;
    process.set("a", {});
    process.set("b", 2);
    if (process.synchronize()) done = 2;
    return done;
  };
  for (const bool corrupt : {false, true}) {
    SCOPED_TRACE(corrupt ? "corrupt before" : "");
    // What the file may hold after each step that reported success.
    const Lines states = corrupt ? Lines{"{}", R"({"a":"new"})", R"({"b":2})"}
                                 : Lines{R"({"a":"old","kept":1})", R"({"a":"new","kept":1})",
                                         R"({"b":2,"kept":1})"};
    const auto prepare = [&](const TemporaryRoot& device) {
      if (corrupt) return device.write(kFile, "garbage");
      Process before(device.root);
      before.set("a", "old");
      before.set("kept", 1);
    };
    strikeEachCall(prepare, [&](const TemporaryRoot& device, FaultyFileSystem& faulty) {
      {
        Process process(device.root, &faulty);
        int done = makeSteps(process);
        if (faulty.goesOn() && faulty.hasStruck()) {
          EXPECT_TRUE(process.synchronize()) << "recovers by itself";
          done = 2;
        }
        faulty.settle();
        Process after(device.root);
        const std::string found = after.all();
        EXPECT_NE(std::find(states.begin() + done, states.end(), found), states.end())
            << found << " although step " << done << " was done";
        EXPECT_TRUE(corrupt || after.log.lines.empty());
      }
      Process again(device.root);
      EXPECT_EQ(makeSteps(again), 2);
      EXPECT_EQ(Process(device.root).all(), states[2]);
    });
  }
}

}  // namespace
}  // namespace tavrel
