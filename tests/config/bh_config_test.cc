#include "config/bh_config.h"

#include <gtest/gtest.h>

#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using plist::Dictionary;
using ::testing::Test;
using Messages = std::vector<std::string>;

const Dictionary kUnchanged = Dictionary::create();

Dictionary figures(int count) {
  return {{"sig_fig", count}};
}

struct BHConfigTest : Test {
  fakes::FakePlatform fake;

  std::unique_ptr<BHConfig> load(const Dictionary& groups) {
    fake.setWhitelist(groups);
    return BHConfig::init(fake.platform);
  }
};

TEST_F(BHConfigTest, ResolvesExactKeysThenTheLongestPrefix) {
  const auto config = load(
      {{"Group",
        Dictionary{{"ScalarKeys", Dictionary{{"a.b.exact", figures(1)}}},
                   {"ScalarKeyPrefixes",
                    Dictionary{{"a.", figures(2)}, {"a.b.", figures(3)}, {"a.b.c.d", figures(4)}}},
                   {"DistributionKeys", Dictionary{{"d", kUnchanged}}},
                   {"DistributionKeyPrefixes", Dictionary{{"", figures(9)}}},
                   {"Scalars", Dictionary{{"ignored", kUnchanged}}}}}});
  ASSERT_TRUE(config);

  EXPECT_EQ(config->configOptionsForScalarKey("a.b.exact"), figures(1));
  EXPECT_EQ(fake.log.messages(LogLevel::Debug), Messages{});
  EXPECT_EQ(config->configOptionsForScalarKey("a.x"), figures(2));
  EXPECT_EQ(config->configOptionsForScalarKey("a.b.c"), figures(3));
  EXPECT_EQ(config->configOptionsForScalarKey("a.b.c.dd"), figures(4));
  EXPECT_EQ(fake.log.messages(LogLevel::Debug),
            (Messages{"prefix match a. for a.x", "prefix match a.b. for a.b.c",
                      "prefix match a.b.c.d for a.b.c.dd"}));

  EXPECT_FALSE(config->configOptionsForScalarKey("a"));
  EXPECT_FALSE(config->configOptionsForScalarKey("A.x"));
  EXPECT_FALSE(config->configOptionsForScalarKey("ignored"));
  EXPECT_FALSE(config->configOptionsForScalarKey("d"));
  EXPECT_EQ(config->configOptionsForDistributionKey("d"), kUnchanged);
  EXPECT_EQ(config->configOptionsForDistributionKey("anything"), figures(9));
  EXPECT_EQ(config->configFileDigest(), "000102030405060708090a0b0c0d0e0f");
}

TEST_F(BHConfigTest, LoadsGroupsByDeviceAndTaskingSwitch) {
  const Dictionary groups{
      {"Disabled", Dictionary{{"ScalarKeys", Dictionary{{"disabled", kUnchanged}}}}},
      {"Enabled", Dictionary{{"ScalarKeys", Dictionary{{"enabled", kUnchanged}}}}},
      {"InternalTesting", Dictionary{{"ScalarKeys", Dictionary{{"internal", kUnchanged}}}}},
      {"Mistyped", Dictionary{{"ScalarKeys", Dictionary{{"mistyped", kUnchanged}}}}}};
  fake.preferences.domain("com.norvane.da") =
      Dictionary{{"Disabled", false}, {"Enabled", true}, {"Mistyped", "no"}};

  auto config = load(groups);
  EXPECT_FALSE(config->configOptionsForScalarKey("disabled"));
  EXPECT_TRUE(config->configOptionsForScalarKey("enabled"));
  EXPECT_FALSE(config->configOptionsForScalarKey("internal"));
  EXPECT_TRUE(config->configOptionsForScalarKey("mistyped"));
  EXPECT_EQ(fake.log.messages(), Messages{"keyGroup Disabled is disabled by tasking"});

  // Each process asks the device only once, so a second process is needed to see the change.
  fake.answers.answers.set("InternalBuild", true);
  EXPECT_FALSE(BHConfig::init(fake.platform)->configOptionsForScalarKey("internal"));
  EXPECT_EQ(fake.answers.questions, Messages{"InternalBuild"});

  fake.state = {};
  fake.log.entries.clear();
  config = BHConfig::init(fake.platform);
  EXPECT_TRUE(config->configOptionsForScalarKey("disabled"));
  EXPECT_TRUE(config->configOptionsForScalarKey("internal"));
  EXPECT_EQ(config->configOptionsForScalarKey("unlisted"), kUnchanged);
  EXPECT_EQ(fake.log.messages(LogLevel::Default), Messages{});
  EXPECT_EQ(fake.log.messages(LogLevel::Debug),
            Messages{"passing @{} for unlisted as device is Norvane Internal"});
}

TEST_F(BHConfigTest, LaterGroupsWinAndWrongTypesArePassedOver) {
  const auto config = load(
      {{"1", Dictionary{{"ScalarKeys", Dictionary{{"twice", figures(1)}, {"kept", figures(1)}}}}},
       {"2", Dictionary{{"ScalarKeys", Dictionary{{"twice", figures(2)}, {"kept", "text"}}}}},
       {"3", "no group"},
       {"4", Dictionary{{"ScalarKeys", plist::Array{"no table"}}}}});
  ASSERT_TRUE(config);
  EXPECT_EQ(config->configOptionsForScalarKey("twice"), figures(2));
  EXPECT_EQ(config->configOptionsForScalarKey("kept"), figures(1));
}

TEST_F(BHConfigTest, YieldsNothingForAFileThatCannotBeUsed) {
  EXPECT_FALSE(BHConfig::init(fake.platform));
  EXPECT_EQ(fake.log.messages(LogLevel::Error),
            (Messages{"Couldn't load whitelist", "no such file"}));

  std::string& content = fake.files.contents[std::string(kWhitelistPath)];
  content = std::string(limits::kWhitelistBytes + 1, ' ');
  EXPECT_FALSE(BHConfig::init(fake.platform));
  EXPECT_EQ(fake.log.messages(LogLevel::Error).back(), "too large");

  content = "<plist><dict></plist>";
  EXPECT_FALSE(BHConfig::init(fake.platform));
  const std::string reason = fake.propertyLists.decode(asBytes(content)).error().message;
  EXPECT_EQ(fake.log.messages(LogLevel::Error).back(),
            "Couldn't parse the contents of the config file. Error: " + reason);

  content = *fake.propertyLists.encodeXml("a text is no whitelist");
  ASSERT_TRUE(BHConfig::init(fake.platform));
  EXPECT_FALSE(BHConfig::init(fake.platform)->configOptionsForScalarKey("a"));
}

// Compares with the plain definition, for prefixes that nest, branch and share beginnings.
TEST(PrefixTreeTest, FindsWhatAWalkOverAllPrefixesFinds) {
  std::vector<std::string> texts{""};
  for (std::size_t i = 0; texts.size() < 364; ++i)
    for (const char c : {'a', 'b', '\xFF'})
      texts.push_back(texts[i] + c);
  for (unsigned step = 1; step < 8; ++step) {
    std::vector<std::string> prefixes;
    for (std::size_t i = step - 1; i < texts.size(); i += step)
      prefixes.push_back(texts[i]);
    const PrefixTree tree(prefixes);
    for (const std::string& key : texts) {
      std::optional<std::string> expected;
      for (const std::string& prefix : prefixes)
        if (key.starts_with(prefix) && (!expected || prefix.size() > expected->size()))
          expected = prefix;
      ASSERT_EQ(tree.longestMatch(key), expected) << key;
    }
  }
  EXPECT_EQ(PrefixTree().longestMatch("a"), std::nullopt);
}

}  // namespace
}  // namespace tavrel
