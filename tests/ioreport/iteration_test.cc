#include <gtest/gtest.h>

#include "base/limits.h"
#include "reporting.h"

namespace tavrel {
namespace {

using namespace reporting;

constexpr auto kKeep = [](const auto&...) { return kIterateContinue; };

// Channels with names of one letter, grouped by driver and group: the first letter of a text names
// the driver, the second the group ("-" for none).
Dictionary treeOf(std::initializer_list<std::string_view> texts) {
  const Dictionary aggregate = IOReportCreateAggregate(3);
  for (const std::string_view text : texts) {
    const Text group = text[1] == '-' ? Text() : text.substr(1, 1);
    const auto id = static_cast<unsigned char>(text[2]);
    IOReportAddChannelDescription(aggregate, 7, text.substr(0, 1), id, 1, {}, group, {}, {}, {});
  }
  return aggregate;
}

Dictionary letters(std::string_view text) {
  Dictionary aggregate = IOReportCreateAggregate(0);
  for (const char letter : text)
    _addChannel(aggregate, channelOf(7, letter, 1), 0, nullptr);
  return aggregate;
}

// A walk and a pruning see the same channels; the last column is what pruning leaves.
TEST(IterationTest, CollectsAnswersUntilAnOddOne) {
  using Case = std::tuple<std::vector<IterateResult>, std::string, IterateResult, std::string>;
  for (const bool isTree : {false, true}) {
    for (const auto& [answers, expected, result, left] :
         {Case({0}, "abcdef", 0, "abcdef"), Case({0, 2, 0, 4}, "abcdef", 6, "abcdef"),
          Case({0, 0, 1, 0}, "abc", 1, "abcdef"), Case({2, 3}, "ab", 3, "abcdef"),
          Case({0, -1, 2}, "ab", -1, "abcdef"), Case({16}, "abcdef", 16, ""),
          Case({16, 0}, "abcdef", 16, "bdf"), Case({0, 16, 16}, "abcdef", 16, "ad"),
          Case({16, 2, 16, 1}, "abcd", 1, "bdef"), Case({16, 17}, "ab", 17, "bcdef")}) {
      for (const auto walk : {IOReportIterate, IOReportPrune}) {
        const Dictionary aggregate =
            isTree ? treeOf({"d-a", "dgb", "dgc", "e-d", "f-e", "f-f"}) : letters("abcdef");
        std::string seen;
        const auto answer = [&, &answers = answers](const Dictionary& channel) {
          seen += IOReportChannelGetChannelName(channel).value_or("?");
          return answers[(seen.size() - 1) % answers.size()];
        };
        EXPECT_EQ(walk(aggregate, answer), result);
        EXPECT_EQ(seen, expected);
        const std::string rest = walk == IOReportPrune ? left : "abcdef";
        EXPECT_EQ(namesIn(aggregate), rest);
        EXPECT_EQ(IOReportGetChannelCount(aggregate), static_cast<std::int32_t>(rest.size()));
        EXPECT_EQ(aggregate.size(), rest.empty() ? 1U : 2U);  // the options, and the rest
      }
    }
  }
}

TEST(IterationTest, FailsForMalformedAggregates) {
  Dictionary endless = Dictionary::create();
  endless.set("IOReportDrivers", Dictionary{{"a", endless}, {"b", endless}});
  Dictionary deep = letters("a");
  Dictionary deepest;
  for (std::size_t i = 0; i < limits::kPropertyListDepth; ++i) {
    deepest = deep;
    deep = Dictionary{{"IOReportChannelGroups", Dictionary{{"g", deepest}}}};
  }
  EXPECT_EQ(IOReportGetChannelCount(deepest), 1);
  const auto drivers = [](const Value& levels) { return Dictionary{{"IOReportDrivers", levels}}; };
  for (const Dictionary& aggregate :
       {Dictionary(), endless, deep, aggregateOf({5}), aggregateOf(5), drivers(5),
        aggregateOf({channelOf(7, 1, 1), "text"}), drivers(Dictionary::create()),
        Dictionary{{"IOReportChannelGroups", Dictionary{{"g", 5}}}},
        drivers(Dictionary{{"d", aggregateOf({5})}})}) {
    EXPECT_EQ(IOReportIterate(aggregate, kKeep), 273);
    EXPECT_EQ(IOReportGetChannelCount(aggregate), -1);
    EXPECT_FALSE(cloneAggregate(aggregate, kKeep));
    EXPECT_FALSE(compareAggregates(aggregate, aggregate, kKeep));
    EXPECT_EQ(IOReportMergeChannels(Dictionary::create(), aggregate, nullptr), 273);
    EXPECT_EQ(IOReportPrune(aggregate, kKeep), 273);
  }
  endless.remove("IOReportDrivers");
  // A clone that nobody takes fails at its end.
  int calls = 0;
  const CloneCallback count = [&](const Dictionary&, Dictionary&) {
    ++calls;
    return kIterateContinue;
  };
  EXPECT_EQ(iterateAggregate(letters("ab"), {}, CloneWalk{count}, nullptr), 273);
  EXPECT_EQ(calls, 2);
  EXPECT_EQ(IOReportIterate(letters("a"), nullptr), 273);
  // Entries that are not levels are skipped when there are others.
  EXPECT_EQ(IOReportGetChannelCount(drivers(Dictionary{{"a", 5}, {"b", letters("b")}})), 1);
}

TEST(IterationTest, MergesByReferenceAsTheDestinationFiles) {
  const Dictionary source = letters("abc");
  const Dictionary destination = IOReportCreateAggregate(1);
  EXPECT_EQ(IOReportMergeChannels(destination, source, nullptr), 0);
  const Dictionary driver = destination.dictionary("IOReportDrivers").dictionary("disk <id 0x7>");
  EXPECT_TRUE(channelIn(driver, 2).isSame(channelIn(source, 2)));
  const std::tuple<Dictionary, IterateResult, std::string> kCases[] = {
      {source, 273, "e00002c2 bad argument"},
      {{}, 273, "e00002c2 bad argument"},
      {aggregateOf("text"), 1, "e00002bc _addChannel() failed"}};
  for (const auto& [into, result, text] : kCases) {
    Failure failure;
    EXPECT_EQ(IOReportMergeChannels(into, source, failure), result);
    EXPECT_EQ(failure.text(), text);
  }
  // Even if the source contains the destination, or shares its channels, the result is finite.
  const Dictionary tree = treeOf({"d-a", "e-b"});
  const Dictionary inside = tree.dictionary("IOReportDrivers").dictionary("d");
  EXPECT_EQ(IOReportMergeChannels(inside, tree, nullptr), 0);
  EXPECT_EQ(namesIn(tree), "aabb");
  const Dictionary sharing = aggregateOf(source.array("IOReportChannels"));
  EXPECT_EQ(IOReportMergeChannels(sharing, source, nullptr), 0);
  EXPECT_EQ(namesIn(source), "abcabc");
}

TEST(IterationTest, ClonesWhatIsKept) {
  const Dictionary tree = treeOf({"d-a", "dgb", "e-c"});
  const Dictionary clone = cloneAggregate(tree, [](const Dictionary& channel, Dictionary& copy) {
    copy.set("ChannelName", "x");
    return IOReportChannelGetChannelName(channel) == "b" ? 4 : kIterateContinue;
  });
  EXPECT_EQ(namesIn(clone) + namesIn(tree), "xxabc");
  EXPECT_FALSE(clone.contains("QueryOpts"));
  const Dictionary driver = clone.dictionary("IOReportDrivers").dictionary("d");
  EXPECT_EQ(driver.get("IOReportChannelGroups"), (Dictionary{{"g", aggregateOf(Array::create())}}));
}

// A channel that is not at its own index is searched for after it, or after the last one that was
// found in this way.
TEST(PairingTest, PairsChannelsAtTheirIndexOrBehindIt) {
  // Channels with names of one letter, the others, and the index of each one's match, "-" for none.
  const std::tuple<std::string_view, std::string_view, std::string_view> kCases[] = {
      {"abc", "abc", "012"},
      {"abc", "acb", "02-"},
      {"ab", "ba", "1-"},
      {"aab", "bba", "2--"},
      {"bcb", "abcbc", "123"},
      {"abcd", "cdab", "23--"},
      {"abca", "bacabc", "1423"},
      {"dzb", "aacbd", "4--"},
      {"dbd", "abcd", "31-"},
      {"aa", "a", "0-"},
      {"aaab", "babc", "11-2"},
      {"ab", "", "--"},
      {"", "ab", ""}};
  const auto samplesOf = [](std::string_view letters) {
    Array samples = Array::create();
    for (std::size_t i = 0; i < letters.size(); ++i) {
      samples.append(sampleOf(1, {{}}, letters[i]));
      samples.at(i).dictionary().set("Position", format("%zu", i));
    }
    return aggregateOf(samples);
  };
  const auto note = [](const Dictionary& match, const Dictionary&, Dictionary& copy) {
    EXPECT_EQ(getRawElements(copy, 1).value(0, 3), kNone);
    copy.set("Match", match.get("Position"));
    return kIterateContinue;
  };
  for (const auto& [channels, others, expected] : kCases) {
    std::string pairs;
    const auto paired = compareAggregates(samplesOf(others), samplesOf(channels), note);
    for (const Value& channel : paired.array("IOReportChannels"))
      pairs += channel.dictionary().string("Match").value_or("-");
    EXPECT_EQ(pairs, expected) << channels << " in " << others;
  }
}

TEST(PairingTest, FailsWhereTheOtherAggregateDiffersInShape) {
  const Dictionary sample = aggregateOf({sampleOf(1, {{}})});
  const Dictionary typeless = aggregateOf({Dictionary{{"DriverID", 7}}});
  const Dictionary noElements = aggregateOf({channelOf(7, 9, typeOf(1, 1))});
  const Dictionary ofD{{"IOReportDrivers", Dictionary{{"d", sample}}}};
  const Dictionary ofE{{"IOReportDrivers", Dictionary{{"e", sample}}}};
  const Dictionary none = aggregateOf(Array::create());
  using Case = std::pair<Dictionary, Dictionary>;
  for (const auto& [other, aggregate] :
       {Case({}, sample), Case(Dictionary::create(), sample), Case(aggregateOf({5}), sample),
        Case(typeless, sample), Case(sample, typeless), Case(none, typeless), Case(sample, ofD),
        Case(noElements, sample), Case(ofE, ofD)})
    EXPECT_FALSE(compareAggregates(other, aggregate, kKeep));
  EXPECT_EQ(compareAggregates(none, sample, kKeep), sample);
}

TEST(SelectionTest, CopiesByCategoryFormatUnitAndGroup) {
  const auto entry = [](const Value& group, const Value& subGroup,
                        std::initializer_list<Value> channels) {
    Dictionary made = aggregateOf(channels);
    made.set("IOReportGroupName", group);
    made.set("IOReportSubGroupName", subGroup);
    made.set("IOReportChannelInfo", IOReportCreateUnitInfo(group ? 1ULL << 63 | 5 : 5));
    return made;
  };
  const Array legend{
      entry({}, {}, {Array{1, typeOf(1, 1, 0x100), "a"}, Array{2, typeOf(2, 1, 0x8101), "b"}}),
      entry("G", {}, {Array{3, 3, "c"}}), entry("G", "S", {Array{4, 1, "d"}}),
      entry("H", "S", {Array{5, 2, "e"}}), entry("H", "T", {Array{6, 2, "f"}})};
  Drivers drivers(Array{driverOf("disk", 7, legend)});
  const auto names = [&](auto copy, auto... what) {
    return namesIn(copy(drivers.registry, drivers.streams, what..., 3, nullptr));
  };
  for (const auto& [categories, left] : {std::pair(0x0100, "ab"), {0x8000, "b"}, {0, ""}})
    EXPECT_EQ(names(IOReportCopyChannelsInCategories, static_cast<std::uint16_t>(categories)),
              left);
  EXPECT_EQ(names(IOReportCopyChannelsOfFormat, std::uint8_t{1}), "ad");
  EXPECT_EQ(names(IOReportCopyChannelsWithUnit, 1ULL << 63 | 5), "cdef");
  EXPECT_EQ(names(IOReportCopyChannelsWithUnit, 5ULL), "ab");
  const std::tuple<Text, Text, std::string_view> kGroups[] = {
      {"G", {}, "cd"}, {{}, "S", "de"}, {"H", "S", "e"}, {"", {}, ""}, {{}, {}, ""}};
  for (const auto& [group, subGroup, left] : kGroups)
    EXPECT_EQ(names(IOReportCopyChannelsInGroup, group, subGroup), left);
  Failure failure;
  EXPECT_EQ(IOReportSelectChannelsInGroup(aggregateOf({5}), "G", {}, failure), 1);
  EXPECT_EQ(failure.text(), "e00002bc channel pruning failed");
  EXPECT_EQ(IOReportSelectChannelsInGroup(letters("a"), {}, {}, failure), 1);
  EXPECT_EQ(failure.text(), "e00002c2 no group or subgroup!");
}

TEST(GetterTest, NamesChannelsByLegendOrId) {
  using Case = std::pair<Array, Text>;
  for (const auto& [legend, name] :
       {Case({1, 1, "named"}, "named"), Case({0x53544154, 1}, "STAT"), Case({0x41004200, 1}, "AB"),
        Case({0x7E20, 1, 5}, "~ "), Case({0x01020304, 1}, {}), Case({0x7F414243, 1}, {}),
        Case({0xE944, 1}, {}), Case({0, 1}, {}), Case({}, {})}) {
    const Dictionary channel{{"LegendChannel", legend}, {"DriverID", 1}};
    EXPECT_EQ(IOReportChannelGetChannelName(channel), name);
    EXPECT_EQ(channel.string("ChannelName"), name);
  }
  const Dictionary kept{{"ChannelName", "kept"}, {"LegendChannel", Array{1, 1, "new"}}};
  EXPECT_EQ(IOReportChannelGetChannelName(kept), "kept");
  EXPECT_EQ(IOReportChannelGetCategories({}), 0xFFFF);
  EXPECT_EQ(IOReportChannelGetDriverID({}), kNone);
}

}  // namespace
}  // namespace tavrel
