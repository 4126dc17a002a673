// The recorded registry: services, numbered methods, the hub, and the folder of recordings.
#include <gtest/gtest.h>

#include "base/format.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/recorded_registry.h"
#include "platform/plist/coding.h"
#include "temporary_root.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Data;
using plist::Dictionary;
using plist::Value;
using Lines = std::vector<std::string>;

std::vector<std::byte> bytesOf(std::initializer_list<int> values) {
  std::vector<std::byte> bytes;
  for (const int value : values)
    bytes.push_back(static_cast<std::byte>(value));
  return bytes;
}
Data dataOf(std::initializer_list<int> values) {
  return Data(bytesOf(values));
}
std::string hexOf(ByteSpan bytes) {
  std::string text;
  appendHex(text, bytes);
  return text;
}

// A group of `count` elements whose first value is `value`.
Data group(std::uint64_t driver, std::uint64_t channel, std::uint16_t count, std::uint64_t value) {
  std::vector<std::byte> bytes(std::size_t{64} * count);
  for (std::size_t at = 0; at < bytes.size(); at += 64) {
    storeLittle64(bytes, at, driver);
    storeLittle64(bytes, at + 8, channel);
    storeLittle16(bytes, at + 20, count);
    storeLittle64(bytes, at + 32, value);
  }
  return Data(bytes);
}
Dictionary hubChannel(std::uint64_t driver, std::uint64_t channel, Value elements) {
  return {{"DriverID", driver}, {"ChannelID", channel}, {"Elements", std::move(elements)}};
}

struct Walked {
  KernelReturn result = 0;
  bool isValid = false;
  std::string names;
  bool operator==(const Walked&) const = default;
};
Walked walk(
    DriverRegistry& registry, const Dictionary& matching,
    const std::function<void()>& midway = [] {}) {
  std::unique_ptr<ServiceIterator> services;
  Walked walked;
  walked.result = registry.matchingServices(matching, services);
  if (!services) return walked;
  while (const auto service = services->next()) {
    std::string name;
    walked.names += service->name(name) == kKernelSuccess ? name + ' ' : "? ";
    midway();
  }
  walked.isValid = services->isValid();
  return walked;
}

std::vector<std::byte> interests(std::uint32_t count,
                                 std::vector<std::pair<std::uint64_t, std::uint64_t>> channels) {
  std::vector<std::byte> list(8 + 24 * channels.size());
  storeLittle32(list, 0, count);
  for (std::size_t i = 0; i < channels.size(); ++i) {
    storeLittle64(list, 8 + 24 * i, channels[i].first);
    storeLittle64(list, 16 + 24 * i, channels[i].second);
  }
  return list;
}

// A connection with its calls in short.
struct Client {
  explicit Client(DriverRegistry& registry, std::string_view className = "IOReportHub") {
    const auto service = registry.firstService(className);
    if (service) opened = service->open(0, client);
  }
  KernelReturn call(std::uint32_t method, std::vector<std::uint64_t> scalars = {},
                    ByteSpan input = {}, std::size_t outputs = 0, std::size_t room = 0) {
    scalarOutput.assign(outputs, 77);
    output.assign(room, std::byte{0xee});
    length = 99;
    return client->callMethod(method, scalars, input, scalarOutput, output, length);
  }
  /// Subscribes and maps: what the mapping shows after each update is read with `show`.
  KernelReturn subscribe(ByteSpan list) {
    if (const auto code = call(0)) return code;
    if (const auto code = call(2, {}, list, 1)) return code;
    bufferID = scalarOutput[0];
    return client->mapMemory(static_cast<std::uint32_t>(bufferID), memory);
  }
  /// "DRIVER/CHANNEL*COUNT=VALUE" of each group.
  std::string show() const {
    std::string text;
    const ByteSpan bytes = memory->bytes();
    for (std::size_t at = 0; at < bytes.size();) {
      const std::uint16_t count = *loadLittle16(bytes, at + 20);
      text += format("%llx/%llx*%u=%llu ", *loadLittle64(bytes, at), *loadLittle64(bytes, at + 8),
                     count, *loadLittle64(bytes, at + 32));
      if (count == 0) break;
      at += std::size_t{64} * count;
    }
    return text;
  }
  KernelReturn opened = kKernelNotFound;
  std::unique_ptr<UserClient> client;
  std::unique_ptr<MappedMemory> memory;
  std::uint64_t bufferID = 0;
  std::vector<std::uint64_t> scalarOutput;
  std::vector<std::byte> output;
  std::size_t length = 0;
};

TEST(RecordedServices, MatchByClassAndProperties) {
  const Array legend{1, 2};
  const Dictionary recording{
      {"Services",
       Array{Dictionary{{"Class", "A"}, {"Name", "a0"}, {"Properties", Dictionary{{"p", true}}}},
             Dictionary{{"Name", "no class"}}, 7, Dictionary{{"Class", "IOReportHub"}},
             Dictionary{{"Class", "B"}, {"Properties", Dictionary{{"p", 1}, {"legend", legend}}}},
             Dictionary{{"Class", "A"},
                        {"Name", std::string(126, 'n') + "\xC3\xBC and more"},
                        {"Properties", Dictionary{{"p", true}, {"legend", legend}}}},
             Dictionary{{"Class", "C"}, {"NameError", kKernelIOError}}}}};
  KeptLog log;
  RecordedRegistry registry(recording, log);
  const std::string longName = std::string(126, 'n') + "\xC3\xBC";
  const struct {
    Dictionary matching;
    Walked walked;
  } kCases[] = {
      {Dictionary::create(), {0, true, "a0 B " + longName + " ? "}},
      {{{"IOProviderClass", "A"}}, {0, true, "a0 " + longName + " "}},
      {{{"IOPropertyMatch", Dictionary{{"p", true}}}}, {0, true, "a0 " + longName + " "}},
      {{{"IOPropertyMatch", Dictionary{{"p", 1.0}}}}, {0, true, "B "}},
      {{{"IOPropertyMatch", Dictionary{{"legend", Array{1, 2}}}}, {"IOProviderClass", "B"}},
       {0, true, "B "}},
      {{{"IOPropertyMatch", Dictionary{{"p", true}, {"q", true}}}}, {0, true, ""}},
      {{{"IOProviderClass", 1}}, {0, true, ""}},
      {{{"IOPropertyMatch", true}}, {0, true, ""}},
      {{{"IOProviderClass", "A"}, {"IONameMatch", "a0"}}, {0, true, ""}},
      {{}, {kKernelBadArgument, false, ""}},
  };
  for (const auto& [matching, walked] : kCases) {
    const Walked found = walk(registry, matching);
    EXPECT_EQ(found, walked) << textOf(matching) << found.names;
  }
  EXPECT_EQ(registry.firstService("D"), nullptr);
  const std::string rest = " is left out: it has no \"Class\"; name the class of the driver";
  EXPECT_EQ(log.lines, (Lines{"recording: service 1" + rest, "recording: service 2" + rest,
                              "recording: service 3 is left out: its \"Class\" is the hub's; "
                              "describe that in \"Hub\""}));

  const auto service = registry.firstService("B");
  const Array own = service->property("legend").array();
  ASSERT_TRUE(own);
  EXPECT_FALSE(own.isSame(legend));
  EXPECT_FALSE(service->property("none"));
}

TEST(RecordedServices, KeepIdsCountsAndParents) {
  const auto node = [](std::string_view className, Value id, Value parents,
                       const Dictionary& properties = {}) {
    return Dictionary{{"Class", className},
                      {"EntryID", std::move(id)},
                      {"Parents", Dictionary{{"IOService", std::move(parents)}}},
                      {"Properties", properties}};
  };
  Dictionary first = node("First", 1, Array{2, 99, "x", 3});
  first.set("RetainCount", 0);
  first.set("OpenError", kKernelUnsupportedMode);
  Dictionary refusing = node("Refusing", 6, {});
  refusing.set("EntryIDError", kKernelAborted);
  const Dictionary recording{
      {"Services",
       Array{first, node("Second", 2, 4), node("Third", 3, 1, {{"far", "third"}}),
             node("Fourth", 4, 2, {{"far", "fourth"}, {"top", "fourth"}}),
             node("Again", 4, {}, {{"top", "again"}}), node("None", {}, 0xFFFFFFFFFFFFFFFFU),
             node("Last", 0xFFFFFFFFFFFFFFFFU, -1, {{"own", 1}}), node("Real", 1.0, 1.0),
             refusing}}};
  KeptLog log;
  RecordedRegistry registry(recording, log);
  EXPECT_EQ(log.lines, Lines{});
  const struct {
    const char* className;
    KernelReturn result;
    std::uint64_t id;
  } kIds[] = {{"First", 0, 1},
              {"Again", 0, 4},
              {"None", kKernelNotFound, 7},
              {"Last", 0, 0xFFFFFFFFFFFFFFFFU},
              {"Real", kKernelNotFound, 7},
              {"Refusing", kKernelAborted, 7}};
  for (const auto& [className, result, id] : kIds) {
    std::uint64_t found = 7;
    EXPECT_EQ(registry.firstService(className)->entryID(found), result) << className;
    EXPECT_EQ(found, id) << className;
  }
  EXPECT_EQ(log.lines, Lines{"recording: entry id 4 of a Again is that of an earlier Fourth, which "
                             "alone is found as a parent; give each service its own"});

  const auto service = registry.firstService("First");
  EXPECT_EQ(service->userRetainCount(), 0U);
  EXPECT_EQ(registry.firstService("Second")->userRetainCount(), 1U);
  std::unique_ptr<UserClient> client;
  EXPECT_EQ(service->open(0, client), kKernelUnsupportedMode);
  EXPECT_EQ(registry.firstService("Second")->open(1, client), kKernelBadArgument);
  EXPECT_EQ(client, nullptr);

  // The nearer generation answers, cycles end, and other planes have no parents.
  const struct {
    const char *className, *plane, *key;
    Value value;
  } kSearches[] = {{"First", "IOService", "far", "third"}, {"First", "IOService", "top", "fourth"},
                   {"First", "IOService", "none", {}},     {"First", "IODeviceTree", "far", {}},
                   {"Again", "IOService", "top", "again"}, {"None", "IOService", "own", 1},
                   {"Last", "IOService", "other", {}},     {"Real", "IOService", "far", {}}};
  for (const auto& [className, plane, key, value] : kSearches) {
    EXPECT_EQ(registry.firstService(className)->searchProperty(plane, key), value)
        << className << ' ' << key;
  }
}

TEST(RecordedDriver, AnswersWithTheFirstRowThatFits) {
  const Dictionary recording{
      {"Services",
       Array{Dictionary{
           {"Class", "D"},
           {"CloseError", kKernelIOError},
           {"Methods",
            Array{Dictionary{{"Method", 8},
                             {"Selector", 13},
                             {"Flags", 1},
                             {"Output", dataOf({4, 0, 0, 0})}},
                  Dictionary{
                      {"Method", 8}, {"Request", dataOf({13, 0})}, {"Output", dataOf({1, 2, 3})}},
                  Dictionary{{"Method", 8}, {"Selector", 0xFFFFFFFFU}, {"Error", kKernelError}},
                  Dictionary{{"Method", 8}, {"OutputLength", 2}, {"Output", dataOf({5, 6, 7})}},
                  "no row", Dictionary{{"Method", 9}, {"OutputLength", 4}, {"Output", dataOf({8})}},
                  Dictionary{{"Method", 10}, {"OutputLength", -1}},
                  Dictionary{{"Method", 11}, {"Scalars", Array{5, -1}}}}}}}}};
  KeptLog log;
  RecordedRegistry registry(recording, log);
  Client client(registry, "D");
  ASSERT_EQ(client.opened, kKernelSuccess);
  const struct {
    std::uint32_t method;
    std::vector<std::byte> input;
    std::size_t scalars, room;
    KernelReturn result;
    std::size_t length;
    const char* output;
  } kCases[] = {
      {8, bytesOf({13, 0, 0, 0, 1, 0}), 0, 4, 0, 4, "04000000"},
      {8, bytesOf({13, 0, 0, 0, 1}), 0, 4, 0, 3, "010203ee"},  // too short to have flags
      {8, bytesOf({13, 0, 0, 0, 0, 0}), 0, 2, kKernelUnderrun, 99, "eeee"},
      {8, bytesOf({255, 255, 255, 255}), 0, 4, kKernelError, 99, "eeeeeeee"},
      {8, bytesOf({13}), 0, 3, 0, 2, "0506ee"},
      {8, {}, 1, 3, kKernelBadArgument, 99, "eeeeee"},  // no scalar is recorded
      {9, {}, 0, 5, 0, 4, "08000000ee"},
      {9, {}, 0, 3, kKernelUnderrun, 99, "eeeeee"},
      {10, {}, 0, 8, kKernelUnderrun, 99, "eeeeeeeeeeeeeeee"},
      {11, {}, 2, 0, 0, 0, ""},
      {12, {}, 0, 0, kKernelBadArgument, 99, ""},
  };
  for (const auto& row : kCases) {
    const std::string name = format("%u %s", row.method, hexOf(row.input));
    EXPECT_EQ(client.call(row.method, {}, row.input, row.scalars, row.room), row.result) << name;
    EXPECT_EQ(client.length, row.length) << name;
    EXPECT_EQ(hexOf(client.output), row.output) << name;
  }
  client.call(11, {}, {}, 2);
  EXPECT_EQ(client.scalarOutput, (std::vector<std::uint64_t>{5, 0xFFFFFFFFFFFFFFFFU}));
  EXPECT_EQ(client.client->mapMemory(1, client.memory), kKernelBadArgument);
  EXPECT_EQ(client.client->close(), kKernelIOError);
  EXPECT_EQ(client.client->close(), kKernelBadArgument);
  EXPECT_EQ(client.call(11), kKernelBadArgument);
}

Dictionary exampleHub() {
  return {
      {"Hub",
       Dictionary{{"EntryID", 9},
                  {"Channels",
                   Array{hubChannel(1, 10, group(1, 10, 1, 100)),
                         hubChannel(1, 11,
                                    Array{group(1, 11, 3, 200), group(1, 11, 1, 201),
                                          group(1, 11, 2, 202)}),
                         hubChannel(2, 10, Array{group(2, 10, 1, 300), group(2, 10, 1, 301)})}}}}};
}

TEST(ReportHub, FillsTheBufferInOrderOfInterest) {
  KeptLog log;
  auto registry = std::make_unique<RecordedRegistry>(exampleHub(), log);
  Client client(*registry);
  ASSERT_EQ(client.subscribe(interests(5, {{2, 10}, {5, 5}, {1, 11}, {2, 10}, {1, 10}})), 0U);
  EXPECT_EQ(client.memory->bytes().size(), std::size_t{64 * 6});
  const std::string rest = "0/8000000000000000";
  const Lines updates{
      "2/a*1=300 1/b*3=200 2/a*1=300 1/a*1=100 ",
      "2/a*1=301 1/b*1=201 2/a*1=301 1/a*1=100 " + rest + "*2=0 ",
      "2/a*1=301 1/b*2=202 2/a*1=301 1/a*1=100 " + rest + "*1=0 ",
      "2/a*1=301 1/b*2=202 2/a*1=301 1/a*1=100 " + rest + "*1=0 ",
  };
  // The connection needs the registry no longer, nor does the mapping need the connection.
  Client second(*registry);
  registry.reset();
  for (const std::string& update : updates) {
    EXPECT_EQ(client.call(3, {client.bufferID}), 0U);
    EXPECT_EQ(client.length, 0U);
    EXPECT_EQ(client.show(), update);
  }
  EXPECT_EQ(client.call(3, {client.bufferID + (std::uint64_t{1} << 32)}), kKernelBadArgument);
  EXPECT_EQ(client.call(3, {client.bufferID + 1}), kKernelBadArgument);

  // Each connection begins with the first groups; nothing known makes one element of no channel.
  ASSERT_EQ(second.subscribe(interests(1, {{5, 5}})), 0U);
  EXPECT_EQ(second.call(3, {second.bufferID}), 0U);
  EXPECT_EQ(second.show(), rest + "*1=0 ");
  const std::uint64_t earlier = second.bufferID;
  const auto earlierMemory = std::move(second.memory);
  ASSERT_EQ(second.subscribe(interests(1, {{1, 11}})), 0U);
  EXPECT_EQ(second.call(3, {second.bufferID}), 0U);
  EXPECT_EQ(second.show(), "1/b*3=200 ");
  EXPECT_EQ(second.call(3, {earlier}), kKernelBadArgument);
  EXPECT_EQ(earlierMemory->bytes().size(), 64U);

  EXPECT_EQ(client.client->close(), 0U);
  client.client.reset();
  EXPECT_EQ(client.show(), updates.back());
  EXPECT_EQ(log.lines, Lines{});
}

TEST(ReportHub, RefusesMalformedCalls) {
  KeptLog log;
  RecordedRegistry registry(exampleHub(), log);
  Client client(registry);
  const auto one = interests(1, {{1, 10}});
  EXPECT_EQ(client.call(2, {}, one, 1), kKernelBadArgument);  // not opened
  EXPECT_EQ(client.call(0, {1}), kKernelBadArgument);
  EXPECT_EQ(client.call(0, {}, one), kKernelBadArgument);
  EXPECT_EQ(client.call(0, {}, {}, 0, 4), kKernelBadArgument);
  EXPECT_EQ(client.call(0), kKernelSuccess);
  EXPECT_EQ(client.call(3, {0}), kKernelBadArgument);  // no buffer
  EXPECT_EQ(client.call(3, {1}), kKernelBadArgument);
  EXPECT_EQ(client.client->mapMemory(0, client.memory), kKernelBadArgument);
  for (const std::uint32_t method : {1U, 4U, 0xFFFFFFFFU})
    EXPECT_EQ(client.call(method), kKernelBadArgument);

  auto reserved = one;
  reserved[7] = std::byte{1};
  const std::vector<std::byte> lists[] = {
      {},
      bytesOf({1, 0, 0, 0}),
      bytesOf({1, 0, 0, 0, 0, 0, 0, 0}),
      interests(0, {{1, 10}}),
      interests(2, {{1, 10}}),
      interests(0x0AAAAAABU, {{1, 10}}),  // whose size is that of one modulo 2^32
      interests(0xFFFFFFFFU, {{1, 10}}),
      std::vector(one.begin(), one.end() - 1),
      reserved,
  };
  for (const auto& list : lists)
    EXPECT_EQ(client.call(2, {}, list, 1), kKernelBadArgument) << hexOf(list);
  EXPECT_EQ(client.call(2, {}, one, 0), kKernelBadArgument);
  EXPECT_EQ(client.call(2, {}, one, 2), kKernelBadArgument);
  EXPECT_EQ(client.call(2, {1}, one, 1), kKernelBadArgument);
  EXPECT_EQ(client.scalarOutput[0], 77U);
  EXPECT_EQ(client.call(2, {}, interests(0, {}), 1), kKernelSuccess);

  // The buffer has the largest size that a device may ask for, and no element more.
  const Dictionary large{
      {"Hub", Dictionary{{"Channels", Array{hubChannel(1, 1, group(1, 1, 0xFFFF, 0)),
                                            hubChannel(1, 2, group(1, 2, 1, 0))}}}}};
  RecordedRegistry largeRegistry(large, log);
  Client greedy(largeRegistry);
  std::vector<std::pair<std::uint64_t, std::uint64_t>> channels(16, {1, 1});
  channels.insert(channels.end(), 16, {1, 2});
  ASSERT_EQ(limits::kDeviceAllocationBytes, std::uint64_t{64} * 16 * 0x10000);
  EXPECT_EQ(greedy.subscribe(interests(32, channels)), kKernelSuccess);
  EXPECT_EQ(greedy.memory->bytes().size(), limits::kDeviceAllocationBytes);
  channels.emplace_back(1, 2);
  EXPECT_EQ(greedy.call(2, {}, interests(33, channels), 1), kKernelNoMemory);
  EXPECT_EQ(greedy.client->close(), kKernelSuccess);
  EXPECT_EQ(greedy.call(3, {1}), kKernelBadArgument);
  EXPECT_EQ(log.lines, Lines{});
}

TEST(ReportHub, RefusesWhatTheRecordingRefuses) {
  KeptLog log;
  const auto code = [&](const char* key, const Value& refusal) {
    const Dictionary recording = exampleHub();
    recording.dictionary("Hub").set(key, refusal);
    RecordedRegistry registry(recording, log);
    Client client(registry);
    KernelReturn last = client.opened;
    if (!last) last = client.subscribe(interests(1, {{1, 10}}));
    if (!last) last = client.call(3, {client.bufferID});
    return last ? last : client.client->close();
  };
  for (const char* method : {"0", "2", "3"})
    EXPECT_EQ(code("MethodErrors", Dictionary{{method, 0xE00002C5}, {"0x", 1}}), 0xE00002C5);
  for (const char* refusal : {"OpenError", "MapError", "CloseError"})
    EXPECT_EQ(code(refusal, kKernelIOError), kKernelIOError) << refusal;

  // What cannot be played is left out of the hub; without a hub there is no service of its class.
  Value tooFew = group(1, 1, 2, 0);
  storeLittle16(tooFew.data().bytes(), 20, 1);
  const Dictionary faulty{
      {"Hub",
       Dictionary{{"Channels",
                   Array{hubChannel(1, 1, tooFew), hubChannel(1, 1, group(1, 2, 1, 0)),
                         hubChannel(1, 1, Array::create()), hubChannel(1, 1, dataOf({1})),
                         hubChannel(1, 1, Array{group(1, 1, 1, 0), group(2, 1, 1, 0)}),
                         Dictionary{{"DriverID", 1}, {"ChannelID", "1"}}, 5,
                         hubChannel(1, 1, group(1, 1, 1, 4)), hubChannel(1, 1, group(1, 1, 1, 5))}},
                  {"MethodErrors", 5}}}};
  log.lines.clear();
  RecordedRegistry registry(faulty, log);
  Client client(registry);
  ASSERT_EQ(client.subscribe(interests(1, {{1, 1}})), kKernelSuccess);
  EXPECT_EQ(client.call(3, {client.bufferID}), kKernelSuccess);
  EXPECT_EQ(client.show(), "1/1*1=4 ");
  ASSERT_EQ(log.lines.size(), 8U);
  EXPECT_EQ(log.lines[4],
            "recording: hub channel 4 is left out: its \"Elements\" are no groups of it; give "
            "elements of 64 bytes with its ids, the first with their number at offset 20");
  EXPECT_EQ(log.lines[5],
            "recording: hub channel 5 is left out: it has no \"DriverID\" or no \"ChannelID\"; "
            "give integers");
  EXPECT_EQ(log.lines[7],
            "recording: hub channel 8 is left out: an earlier one has its ids; give each channel "
            "of a driver its own");
  RecordedRegistry empty(Dictionary::create(), log);
  EXPECT_EQ(empty.firstService("IOReportHub"), nullptr);
}

class RecordingFolderTest : public testing::Test {
 protected:
  void write(const std::string& name, const Value& recording) {
    device.write("/var/lib/tavrel/registry/" + name, *coding.encodeXml(recording));
  }
  std::string path(const std::string& name) const {
    return device.root.path("/var/lib/tavrel/registry/" + name);
  }
  static Dictionary withService(std::string_view name, int generation) {
    return {{"Generation", generation},
            {"Services", Array{Dictionary{{"Class", "S"}, {"Name", name}, {"EntryID", 1}}}}};
  }

  TemporaryRoot device;
  KeptLog log;
  FileLayer files;
  plist::PlistCoding coding;
  RecordedRegistry registry{device.root, files, coding, log};
};

TEST_F(RecordingFolderTest, FollowsItsFiles) {
  const Dictionary all = Dictionary::create();
  EXPECT_EQ(walk(registry, all), (Walked{0, true, ""}));
  EXPECT_EQ(log.lines, Lines{});

  write("b.plist", withService("b", 1));
  write("a.plist", withService("a", 2));
  write("c.xml", withService("c", 4));
  device.write("/var/lib/tavrel/registry/d.plist", "nonsense");
  EXPECT_EQ(walk(registry, all), (Walked{0, true, "a b "}));
  EXPECT_EQ(walk(registry, all), (Walked{0, true, "a b "}));
  ASSERT_EQ(log.lines.size(), 2U);  // what is wrong is told once
  EXPECT_TRUE(log.lines[0].starts_with("cannot read " + path("d.plist") + ": "));
  EXPECT_TRUE(log.lines[1].starts_with(path("b.plist") + ": entry id 1 of a S is that of "));

  // A walk keeps what it began with, and says whether the generation is still the same.
  int steps = 0;
  const Walked same = walk(registry, all, [&] {
    if (++steps == 1) write("e.plist", withService("e", 0));
  });
  EXPECT_EQ(same, (Walked{0, true, "a b "}));
  steps = 0;
  const Walked changed = walk(registry, all, [&] {
    if (++steps == 1) write("b.plist", withService("b2", 2));
  });
  EXPECT_EQ(changed, (Walked{0, false, "a b e "}));
  EXPECT_EQ(walk(registry, all), (Walked{0, true, "a b2 e "}));
  std::filesystem::remove_all(device.root.path("/var/lib/tavrel/registry"));
  EXPECT_EQ(walk(registry, all), (Walked{0, true, ""}));

  // The generation of a dictionary that is played is seen at once.
  Dictionary played = withService("p", 1);
  RecordedRegistry player(played, log);
  const Walked aborted = walk(player, all, [&] {
    played.set("Generation", 2);
    played.array("Services").append(Dictionary{{"Class", "T"}});
  });
  EXPECT_EQ(aborted, (Walked{0, false, "p "}));
  EXPECT_EQ(walk(player, all).names, "p T ");
}

TEST_F(RecordingFolderTest, IsOneRecordingThatPlaysTheSame) {
  Dictionary first = exampleHub();
  first.dictionary("Hub").set("MethodErrors", Dictionary{{"4", 5}});
  first.set("Services", Array{Dictionary{{"Class", "A"}, {"Methods", Array::create()}}});
  write("1.plist", first);
  write("2.plist",
        Dictionary{{"Generation", 7},
                   {"Hub", Dictionary{{"Channels", Array{hubChannel(3, 3, group(3, 3, 1, 33))}},
                                      {"EntryID", 10},
                                      {"MapError", 0},
                                      {"MethodErrors", Dictionary{{"4", 6}, {"5", 7}}}}},
                   {"Services", Array{Dictionary{{"Class", "B"}}}}});
  const Dictionary merged = registry.recording();
  RecordedRegistry player(merged, log);
  for (RecordedRegistry* played : {&registry, &player}) {
    EXPECT_EQ(walk(*played, Dictionary::create()).names, "A B IOReportHub ");
    std::uint64_t id = 0;
    EXPECT_EQ(played->firstService("IOReportHub")->entryID(id), kKernelSuccess);
    EXPECT_EQ(id, 9U);
    Client client(*played);
    ASSERT_EQ(client.subscribe(interests(2, {{3, 3}, {1, 10}})), kKernelSuccess);
    EXPECT_EQ(client.call(3, {client.bufferID}), kKernelSuccess);
    EXPECT_EQ(client.show(), "3/3*1=33 1/a*1=100 ");
    EXPECT_EQ(client.call(4), 5U);
    EXPECT_EQ(client.call(5), 7U);
  }
  EXPECT_EQ(Value(player.recording()), Value(merged));
  EXPECT_EQ(merged.number("Generation")->int64(), 7);
  EXPECT_EQ(log.lines, Lines{});
}

}  // namespace
}  // namespace tavrel
