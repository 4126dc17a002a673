// The recorded registry: services, numbered methods, the hub, and the folder of recordings.

#include "platform/linux/recorded/recorded_registry.h"
#include "platform/linux/recorded/recorded_snapshots.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Data;
using plist::Dictionary;
using plist::Value;

std::vector<std::byte> bytesOf(std::initializer_list<unsigned char> values) {
  const auto bytes = std::as_bytes(std::span(values.begin(), values.size()));
  return {bytes.begin(), bytes.end()};
}
Data dataOf(std::initializer_list<unsigned char> values) {
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
Dictionary hubChannel(std::uint64_t driver, std::uint64_t channel, const Value& elements) {
  return {{"DriverID", driver}, {"ChannelID", channel}, {"Elements", elements}};
}
Dictionary hub(const Array& channels) {
  return {{"Hub", Dictionary{{"EntryID", 9}, {"Channels", channels}}}};
}
Dictionary service(std::string_view className, Dictionary more = Dictionary::create()) {
  more.set("Class", className);
  return more;
}

// Names of the matching services, followed by "!" if the walk failed or the registry changed, or
// just a code if there was no walk.
std::string walk(
    DriverRegistry& registry, const Dictionary& matching = Dictionary::create(),
    const std::function<void()>& midway = [] {}) {
  std::unique_ptr<ServiceIterator> services;
  const KernelReturn result = registry.matchingServices(matching, services);
  if (!services) return format("%x", result);
  std::string names;
  while (const auto service = services->next()) {
    std::string name;
    names += service->name(name) == kKernelSuccess ? name + ' ' : "? ";
    midway();
  }
  return names + (services->isValid() && !result ? "" : "!");
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

// A connection, with short forms of its calls.
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
  KernelReturn subscribe(ByteSpan list) {
    if (const auto code = call(0)) return code;
    if (const auto code = call(2, {}, list, 1)) return code;
    bufferID = scalarOutput[0];
    return client->mapMemory(static_cast<std::uint32_t>(bufferID), memory);
  }
  /// The content of the mapping after an update, or the update's code.
  std::string update() {
    const auto code = call(3, {bufferID});
    return code ? format("%x", code) : show();
  }
  /// "DRIVER/CHANNEL*COUNT=VALUE" for each group.
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

struct RegistryTest : testing::Test {
  KeptLog log;
};

TEST_F(RegistryTest, ServicesMatchByClassAndProperties) {
  const Array legend{1, 2};
  const std::string longName = std::string(126, 'n') + "\xC3\xBC";
  const Dictionary own{{"p", true}}, counted{{"p", 1}, {"legend", legend}};
  const Dictionary both{{"p", true}, {"legend", legend}};
  const Array services{service("A", {{"Name", "a0"}, {"Properties", own}}),
                       Dictionary{{"Name", "no class"}},
                       7,
                       service("IOReportHub"),
                       service("B", {{"Properties", counted}}),
                       service("A", {{"Name", longName + " and more"}, {"Properties", both}}),
                       service("C", {{"NameError", kKernelIOError}})};
  RecordedRegistry registry({{"Services", services}}, log);
  const auto property = [](const Value& match) { return Dictionary{{"IOPropertyMatch", match}}; };
  Dictionary classAndLegend = property(Dictionary{{"legend", Array{1, 2}}});
  classAndLegend.set("IOProviderClass", "B");
  using Case = std::pair<Dictionary, std::string>;
  for (const auto& [matching, names] :
       {Case(Dictionary::create(), "a0 B " + longName + " ? "),
        Case({{"IOProviderClass", "A"}}, "a0 " + longName + " "),
        Case(property(own), "a0 " + longName + " "), Case(property(Dictionary{{"p", 1.0}}), "B "),
        Case(classAndLegend, "B "), Case(property(Dictionary{{"p", true}, {"q", true}}), ""),
        Case({{"IOProviderClass", 1}}, ""), Case(property(true), ""),
        Case({{"IOProviderClass", "A"}, {"IONameMatch", "a0"}}, ""),
        Case({}, format("%x", kKernelBadArgument))})
    EXPECT_EQ(walk(registry, matching), names) << textOf(matching);
  EXPECT_EQ(registry.firstService("D"), nullptr);
  const std::string rest = " is left out: it has no \"Class\"; name the class of the driver";
  EXPECT_EQ(log.lines, (Lines{"recording: service 1" + rest, "recording: service 2" + rest,
                              "recording: service 3 is left out: its \"Class\" is the hub's; "
                              "describe that in \"Hub\""}));
  const auto found = registry.firstService("B");
  EXPECT_EQ(found->property("legend"), legend);
  EXPECT_FALSE(found->property("legend").array().isSame(legend));
  EXPECT_FALSE(found->property("none"));
}

TEST_F(RegistryTest, ServicesKeepIdsCountsAndParents) {
  constexpr std::uint64_t kMost = 0xFFFFFFFFFFFFFFFF;
  const auto node = [](const char* className, const Value& id, const Value& parents,
                       const Dictionary& properties = {}) {
    const Dictionary planes{{"IOService", parents}};
    return service(className, {{"EntryID", id}, {"Parents", planes}, {"Properties", properties}});
  };
  Dictionary first = node("First", 1, Array{2, 99, "x", 3});
  first.set("RetainCount", 0);
  first.set("OpenError", kKernelUnsupportedMode);
  Dictionary refusing = node("Refusing", 6, {});
  refusing.set("EntryIDError", kKernelAborted);
  const Array services{first,
                       node("Second", 2, 4),
                       node("Third", 3, 1, {{"far", "third"}}),
                       node("Fourth", 4, 2, {{"far", "fourth"}, {"top", "fourth"}}),
                       node("Again", 4, {}, {{"top", "again"}}),
                       node("None", {}, kMost),
                       node("Last", kMost, -1, {{"own", 1}}),
                       refusing};
  RecordedRegistry registry({{"Services", services}}, log);
  EXPECT_EQ(log.lines, Lines{});
  std::string ids;
  for (const char* className : {"First", "Again", "None", "Last", "Refusing"}) {
    std::uint64_t id = 7;
    const KernelReturn result = registry.firstService(className)->entryID(id);
    appendFormat(ids, "%s %x %llx, ", className, result, id);
  }
  EXPECT_EQ(ids, format("First 0 1, Again 0 4, None %x 7, Last 0 %llx, Refusing %x 7, ",
                        kKernelNotFound, kMost, kKernelAborted));
  EXPECT_EQ(log.lines, Lines{"recording: entry id 4 of a Again is that of an earlier Fourth, which "
                             "alone is found as a parent; give each service its own"});

  EXPECT_EQ(registry.firstService("First")->userRetainCount(), 0U);
  EXPECT_EQ(registry.firstService("Second")->userRetainCount(), 1U);
  std::unique_ptr<UserClient> client;
  EXPECT_EQ(registry.firstService("First")->open(0, client), kKernelUnsupportedMode);
  EXPECT_EQ(registry.firstService("Second")->open(1, client), kKernelBadArgument);
  EXPECT_EQ(client, nullptr);

  // The nearer generation answers, cycles end, and other planes have no parents.
  const auto search = [&](const char* className, const char* key, const char* plane = "IOService") {
    return textOf(registry.firstService(className)->searchProperty(plane, key)) + ' ';
  };
  EXPECT_EQ(search("First", "far") + search("First", "top") + search("Again", "top") +
                search("None", "own"),
            "third fourth again 1 ");
  EXPECT_EQ(
      search("First", "none") + search("First", "far", "IODeviceTree") + search("Last", "other"),
      "(null) (null) (null) ");
}

TEST_F(RegistryTest, DriversAnswerWithTheFirstRowThatFits) {
  const auto row = [](int method, Dictionary more) {
    more.set("Method", method);
    return more;
  };
  const Array methods{row(8, {{"Selector", 13}, {"Flags", 1}, {"Output", dataOf({4, 0, 0, 0})}}),
                      row(8, {{"Request", dataOf({13, 0})}, {"Output", dataOf({1, 2, 3})}}),
                      row(8, {{"Selector", 0xFFFFFFFFU}, {"Error", kKernelError}}),
                      row(8, {{"OutputLength", 2}, {"Output", dataOf({5, 6, 7})}}),
                      row(9, {{"OutputLength", 4}, {"Output", dataOf({8})}}),
                      row(10, {{"OutputLength", -1}}),
                      row(11, {{"Scalars", Array{5, -1}}})};
  const Array services{service("D", {{"CloseError", kKernelIOError}, {"Methods", methods}})};
  RecordedRegistry registry({{"Services", services}}, log);
  Client client(registry, "D");
  ASSERT_EQ(client.opened, kKernelSuccess);
  const std::tuple<std::uint32_t, std::vector<std::byte>, std::size_t, std::size_t, KernelReturn,
                   std::size_t, const char*>
      kCases[] = {
          {8, bytesOf({13, 0, 0, 0, 1, 0}), 0, 4, 0, 4, "04000000"},
          {8, bytesOf({13, 0, 0, 0, 1}), 0, 4, 0, 3, "010203ee"},  // too short to hold flags
          {8, bytesOf({13, 0, 0, 0, 0, 0}), 0, 2, kKernelUnderrun, 99, "eeee"},
          {8, bytesOf({255, 255, 255, 255}), 0, 4, kKernelError, 99, "eeeeeeee"},
          {8, bytesOf({13}), 0, 3, 0, 2, "0506ee"},
          {8, {}, 1, 3, kKernelBadArgument, 99, "eeeeee"},  // no scalar is recorded
          {9, {}, 0, 5, 0, 4, "08000000ee"},
          {9, {}, 0, 3, kKernelUnderrun, 99, "eeeeee"},
          {10, {}, 0, 8, kKernelUnderrun, 99, "eeeeeeeeeeeeeeee"},
          {11, {}, 2, 0, 0, 0, ""},
          {12, {}, 0, 0, kKernelBadArgument, 99, ""}};
  for (const auto& [method, input, scalars, room, result, length, output] : kCases) {
    const std::string name = format("%u %s", method, hexOf(input));
    EXPECT_EQ(client.call(method, {}, input, scalars, room), result) << name;
    EXPECT_EQ(client.length, length) << name;
    EXPECT_EQ(hexOf(client.output), output) << name;
  }
  client.call(11, {}, {}, 2);
  EXPECT_EQ(client.scalarOutput, (std::vector<std::uint64_t>{5, 0xFFFFFFFFFFFFFFFFU}));
  EXPECT_EQ(client.client->mapMemory(1, client.memory), kKernelBadArgument);
  EXPECT_EQ(client.client->close(), kKernelIOError);
  EXPECT_EQ(client.client->close(), kKernelBadArgument);
  EXPECT_EQ(client.call(11), kKernelBadArgument);
}

TEST_F(RegistryTest, LeavesOutWhatIsMalformed) {
  const Value slips[] = {"0xE00002BC", 1.5, true, Array{5, "6"}};
  Lines lines{"\"Generation\" is left out: it must be an integer"};
  Array services = Array::create(), rows = Array::create();
  const auto add = [&](Array& records, const char* what, Dictionary record, const char* key,
                       const char* must) {
    record.set(key, slips[records.size() % 4]);
    lines.push_back(format("%s %zu", what, records.size()) +
                    (records.isSame(rows) ? " of the \"Methods\" of service 4" : "") +
                    " is left out: its \"" + key + "\" must be " + must);
    records.append(record);
  };
  add(services, "service", service("A"), "Methods", "an array");
  for (const char* key : {"OpenError", "EntryID", "RetainCount"})
    add(services, "service", service("A"), key, "an integer");
  for (const char* key : {"Method", "Selector", "Flags", "Error", "OutputLength"})
    add(rows, "row", {{"Method", 8}}, key, "an integer");
  for (const char* key : {"Request", "Output"})
    add(rows, "row", {{"Method", 8}}, key, "data, in JSON {\"$data\": \"BASE64\"}");
  add(rows, "row", {{"Method", 8}}, "Scalars", "an array of integers");
  lines.insert(lines.end(),
               {"row 8 of the \"Methods\" of service 4 is left out: it has no \"Method\"; "
                "give the number of the method",
                "\"Channels\" of the hub is left out: it must be an array",
                "\"0\" of the hub's \"MethodErrors\" is left out: it must be an integer"});
  rows.append("no row");
  rows.append(Dictionary{{"Method", 8}, {"Output", dataOf({7})}});
  services.append(service("B", {{"Methods", rows}}));
  const Dictionary errors{{"0", "0xE00002CA"}, {"2", 6}};
  RecordedRegistry registry({{"Generation", "7"},
                             {"Services", services},
                             {"Hub", Dictionary{{"Channels", 5}, {"MethodErrors", errors}}}},
                            log);
  EXPECT_EQ(walk(registry), "B IOReportHub ");
  for (std::string& line : lines)
    line.insert(0, "recording: ");
  EXPECT_EQ(log.lines, lines);
  Client driver(registry, "B"), client(registry);
  EXPECT_EQ(driver.call(8, {}, {}, 0, 2), kKernelSuccess);
  EXPECT_EQ(hexOf(driver.output), "07ee");
  EXPECT_EQ(client.call(0), kKernelSuccess);
  EXPECT_EQ(client.call(2), 6U);
}

Dictionary exampleHub() {
  const Array three{group(1, 11, 3, 200), group(1, 11, 1, 201), group(1, 11, 2, 202)};
  const Array two{group(2, 10, 1, 300), group(2, 10, 1, 301)};
  return hub(
      {hubChannel(1, 10, group(1, 10, 1, 100)), hubChannel(1, 11, three), hubChannel(2, 10, two)});
}

TEST_F(RegistryTest, TheHubFillsTheBufferInOrderOfInterest) {
  auto registry = std::make_unique<RecordedRegistry>(exampleHub(), log);
  Client client(*registry);
  ASSERT_EQ(client.subscribe(interests(5, {{2, 10}, {5, 5}, {1, 11}, {2, 10}, {1, 10}})), 0U);
  EXPECT_EQ(client.memory->bytes().size(), 64U * 6);
  const std::string rest = "0/8000000000000000";
  const Lines updates{"2/a*1=300 1/b*3=200 2/a*1=300 1/a*1=100 ",
                      "2/a*1=301 1/b*1=201 2/a*1=301 1/a*1=100 " + rest + "*2=0 ",
                      "2/a*1=301 1/b*2=202 2/a*1=301 1/a*1=100 " + rest + "*1=0 ",
                      "2/a*1=301 1/b*2=202 2/a*1=301 1/a*1=100 " + rest + "*1=0 "};
  // The connection does not need the registry any more, nor does the mapping need the connection.
  Client second(*registry);
  registry.reset();
  for (const std::string& update : updates) {
    EXPECT_EQ(client.update(), update);
    EXPECT_EQ(client.length, 0U);
  }
  EXPECT_EQ(client.call(3, {client.bufferID + (std::uint64_t{1} << 32)}), kKernelBadArgument);
  EXPECT_EQ(client.call(3, {client.bufferID + 1}), kKernelBadArgument);

  // Each connection begins with the first groups; unknown channels make one element of none.
  ASSERT_EQ(second.subscribe(interests(1, {{5, 5}})), 0U);
  EXPECT_EQ(second.update(), rest + "*1=0 ");
  const std::uint64_t earlier = second.bufferID;
  const auto earlierMemory = std::move(second.memory);
  ASSERT_EQ(second.subscribe(interests(1, {{1, 11}})), 0U);
  EXPECT_EQ(second.update(), "1/b*3=200 ");
  EXPECT_EQ(second.call(3, {earlier}), kKernelBadArgument);
  EXPECT_EQ(earlierMemory->bytes().size(), 64U);

  EXPECT_EQ(client.client->close(), 0U);
  client.client.reset();
  EXPECT_EQ(client.show(), updates.back());
  EXPECT_EQ(log.lines, Lines{});
}

TEST_F(RegistryTest, TheHubRefusesMalformedCalls) {
  RecordedRegistry registry(exampleHub(), log);
  Client client(registry);
  const auto one = interests(1, {{1, 10}});
  auto reserved = one;
  reserved[7] = std::byte{1};
  const auto tooMany = interests(0x0AAAAAABU, {{1, 10}});  // its size is that of one, modulo 2^32
  auto refused = [index = 0](std::initializer_list<KernelReturn> codes) mutable {
    for (const KernelReturn code : codes)
      EXPECT_EQ(code, kKernelBadArgument) << index++;
  };
  refused({client.call(2, {}, one, 1), client.call(0, {1}), client.call(0, {}, one),
           client.call(0, {}, {}, 0, 4)});
  EXPECT_EQ(client.call(0), kKernelSuccess);
  refused({client.call(3, {0}), client.call(3, {1}), client.client->mapMemory(0, client.memory),
           client.call(1), client.call(4), client.call(0xFFFFFFFF), client.call(2, {}, one, 0),
           client.call(2, {}, one, 2), client.call(2, {1}, one, 1)});
  for (const auto& list :
       {std::vector<std::byte>(), bytesOf({1, 0, 0, 0}), bytesOf({1, 0, 0, 0, 0, 0, 0, 0}),
        interests(0, {{1, 10}}), interests(2, {{1, 10}}), tooMany,
        interests(0xFFFFFFFFU, {{1, 10}}), std::vector(one.begin(), one.end() - 1), reserved})
    EXPECT_EQ(client.call(2, {}, list, 1), kKernelBadArgument) << hexOf(list);
  EXPECT_EQ(client.scalarOutput[0], 77U);
  EXPECT_EQ(client.call(2, {}, interests(0, {}), 1), kKernelSuccess);

  // The buffer has the largest size that a device may ask for, and not one element more.
  RecordedRegistry largeRegistry(
      hub({hubChannel(1, 1, group(1, 1, 0xFFFF, 0)), hubChannel(1, 2, group(1, 2, 1, 0))}), log);
  Client greedy(largeRegistry);
  std::vector<std::pair<std::uint64_t, std::uint64_t>> channels(16, {1, 1});
  channels.insert(channels.end(), 16, {1, 2});
  ASSERT_EQ(limits::kDeviceAllocationBytes, std::uint64_t{64} * 16 * 0x10000);
  EXPECT_EQ(greedy.subscribe(interests(32, channels)), kKernelSuccess);
  EXPECT_EQ(greedy.memory->bytes().size(), limits::kDeviceAllocationBytes);
  channels.emplace_back(1, 2);
  EXPECT_EQ(greedy.call(2, {}, interests(33, channels), 1), kKernelNoMemory);
  EXPECT_EQ(greedy.client->close(), kKernelSuccess);
  EXPECT_EQ(greedy.call(0), kKernelBadArgument);
  EXPECT_EQ(log.lines, Lines{});
}

TEST_F(RegistryTest, TheHubRefusesWhatTheRecordingRefuses) {
  const auto code = [&](const char* key, const Value& refusal) {
    const Dictionary recording = exampleHub();
    recording.dictionary("Hub").set(key, refusal);
    RecordedRegistry registry(recording, log);
    Client client(registry);
    if (client.opened) return client.opened;
    if (const auto refused = client.subscribe(interests(1, {{1, 10}}))) return refused;
    const auto updated = client.call(3, {client.bufferID});
    return updated ? updated : client.client->close();
  };
  for (const char* method : {"0", "2", "3"})
    EXPECT_EQ(code("MethodErrors", Dictionary{{method, 0xE00002C5}, {"0x", 1}}), 0xE00002C5);
  for (const char* refusal : {"OpenError", "MapError", "CloseError"})
    EXPECT_EQ(code(refusal, kKernelIOError), kKernelIOError) << refusal;

  // Groups that cannot be played are left out of the hub; without a hub, its class has no service.
  Value tooFew = group(1, 1, 2, 0);
  storeLittle16(tooFew.data().bytes(), 20, 1);
  const Dictionary faulty =
      hub({hubChannel(1, 1, tooFew), hubChannel(1, 1, group(1, 2, 1, 0)),
           hubChannel(1, 1, Array::create()), hubChannel(1, 1, dataOf({1})),
           hubChannel(1, 1, Array{group(1, 1, 1, 0), group(2, 1, 1, 0)}),
           Dictionary{{"DriverID", 1}, {"ChannelID", "1"}}, 5, hubChannel(1, 1, group(1, 1, 1, 4)),
           hubChannel(1, 1, group(1, 1, 1, 5))});
  faulty.dictionary("Hub").set("MethodErrors", 5);
  log.lines.clear();
  RecordedRegistry registry(faulty, log);
  Client client(registry);
  ASSERT_EQ(client.subscribe(interests(1, {{1, 1}})), kKernelSuccess);
  EXPECT_EQ(client.update(), "1/1*1=4 ");
  ASSERT_EQ(log.lines.size(), 9U);
  for (const auto& [line, text] :
       {std::pair(
            4U,
            "4 is left out: its \"Elements\" are not groups of this channel; give elements of 64 "
            "bytes with its ids, the first with their number at offset 20"),
        std::pair(5U, "5 is left out: it has no \"DriverID\" or no \"ChannelID\"; give integers"),
        std::pair(
            7U,
            "8 is left out: an earlier channel has the same ids; give each channel of a driver "
            "its own")})
    EXPECT_EQ(log.lines[line], std::string("recording: hub channel ") + text);
  RecordedRegistry empty(Dictionary::create(), log);
  EXPECT_EQ(empty.firstService("IOReportHub"), nullptr);
}

class RecordingFolderTest : public testing::Test, protected DeviceServices {
 protected:
  void record(const std::string& name, const Value& recording) {
    write("/var/lib/tavrel/registry/" + name, *coding.encodeXml(recording));
  }
  std::string path(const std::string& name) const {
    return root.path("/var/lib/tavrel/registry/" + name);
  }
  static Dictionary withService(std::string_view name, int generation) {
    const Array services{service("S", {{"Name", name}, {"EntryID", 1}})};
    return {{"Generation", generation}, {"Services", services}};
  }

  RecordedRegistry registry{root, files, coding, log};
};

TEST_F(RecordingFolderTest, FollowsItsFiles) {
  const Dictionary all = Dictionary::create();
  EXPECT_EQ(walk(registry), "");
  EXPECT_EQ(log.lines, Lines{});

  record("b.plist", withService("b", 1));
  record("a.plist", withService("a", 2));
  record("c.xml", withService("c", 4));
  write("/var/lib/tavrel/registry/d.plist", "nonsense");
  EXPECT_EQ(walk(registry), "a b ");
  EXPECT_EQ(walk(registry), "a b ");
  ASSERT_EQ(log.lines.size(), 2U);  // each fault is reported once
  EXPECT_TRUE(log.lines[0].starts_with("cannot read " + path("d.plist") + ": "));
  EXPECT_TRUE(log.lines[1].starts_with(path("b.plist") + ": entry id 1 of a S is that of "));

  // A walk keeps the state it began with, and says whether the generation is still the same.
  EXPECT_EQ(walk(registry, all, [&] { record("e.plist", withService("e", 0)); }), "a b ");
  EXPECT_EQ(walk(registry, all, [&] { record("b.plist", withService("b2", 2)); }), "a b e !");
  EXPECT_EQ(walk(registry), "a b2 e ");
  std::filesystem::remove_all(root.path("/var/lib/tavrel/registry"));
  EXPECT_EQ(walk(registry), "");

  // A new generation of a dictionary that is played shows at once.
  Dictionary played = withService("p", 1);
  RecordedRegistry player(played, log);
  const auto change = [&] {
    played.set("Generation", 2);
    played.array("Services").append(service("T"));
  };
  EXPECT_EQ(walk(player, all, change), "p !");
  EXPECT_EQ(walk(player), "p T ");
}

TEST_F(RecordingFolderTest, HoldsASnapshot) {
  const auto snapshot = RecordedSnapshots(root, files, log).create();
  EXPECT_FALSE(snapshot->capture());
  EXPECT_EQ(log.lines, Lines{});
  write("/var/lib/tavrel/registry/stack-snapshot.bin", "bytes");
  EXPECT_TRUE(snapshot->capture());
  EXPECT_EQ(asText(*snapshot->buffer()), "bytes");
  std::filesystem::resize_file(path("stack-snapshot.bin"), limits::kDeviceAllocationBytes + 1);
  EXPECT_FALSE(snapshot->capture());
  EXPECT_EQ(log.lines, Lines{"cannot use " + path("stack-snapshot.bin") +
                             ": it has more than 67108864 bytes; move it away"});
}

TEST_F(RecordingFolderTest, IsOneRecordingThatPlaysTheSame) {
  Dictionary first = exampleHub();
  first.dictionary("Hub").set("MethodErrors", Dictionary{{"4", 5}});
  first.set("Services", Array{service("A", {{"Methods", Array::create()}})});
  record("1.plist", first);
  const Dictionary hubOfSecond{{"EntryID", 10},
                               {"Channels", Array{hubChannel(3, 3, group(3, 3, 1, 33))}},
                               {"MapError", 0},
                               {"MethodErrors", Dictionary{{"4", 6}, {"5", 7}}}};
  record("2.plist",
         Dictionary{{"Hub", hubOfSecond}, {"Generation", 7}, {"Services", Array{service("B")}}});
  const Dictionary merged = registry.recording();
  RecordedRegistry player(merged, log);
  for (RecordedRegistry* played : {&registry, &player}) {
    EXPECT_EQ(walk(*played), "A B IOReportHub ");
    std::uint64_t id = 0;
    EXPECT_EQ(played->firstService("IOReportHub")->entryID(id), kKernelSuccess);
    EXPECT_EQ(id, 9U);
    Client client(*played);
    ASSERT_EQ(client.subscribe(interests(2, {{3, 3}, {1, 10}})), kKernelSuccess);
    EXPECT_EQ(client.update(), "3/3*1=33 1/a*1=100 ");
    EXPECT_EQ(client.call(4), 5U);
    EXPECT_EQ(client.call(5), 7U);
  }
  EXPECT_EQ(Value(player.recording()), Value(merged));
  EXPECT_EQ(merged.number("Generation")->int64(), 7);
  EXPECT_EQ(log.lines, Lines{});
}

TEST_F(RegistryTest, AChannelMayBeAbsentFromAnUpdate) {
  const Data absent{ByteSpan()};
  RecordedRegistry registry(
      hub({hubChannel(1, 1, Array{absent, group(1, 1, 1, 7), absent}),
           hubChannel(1, 2, group(1, 2, 1, 8)), hubChannel(1, 3, Array{absent})}),
      log);
  Client client(registry);
  ASSERT_EQ(client.subscribe(interests(2, {{1, 1}, {1, 2}})), kKernelSuccess);
  EXPECT_EQ(client.update(), "1/2*1=8 0/8000000000000000*1=0 ");
  EXPECT_EQ(client.update(), "1/1*1=7 1/2*1=8 ");
  EXPECT_EQ(client.update(), "1/2*1=8 0/8000000000000000*1=0 ");
  EXPECT_EQ(log.lines.size(), 1U);  // a list of absences only is not a sequence
}

}  // namespace
}  // namespace tavrel
