// Recordings of drivers, played as the registry does: services are named, searched and called, the
// hub is subscribed to and sampled. A recording of what was shown must show the same again, and
// what a connection hands out must stay within its buffer.
//
// Input: a byte. When it is even, property lists separated by 0xFF follow (or a single binary one);
// when it is odd, values that look like recordings.
#include <array>
#include <vector>

#include "ioreport/ioreport.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/linux/recorded/recording.h"
#include "platform/plist/coding.h"
#include "platform/report_protocol.h"
#include "reporting_values.h"
#include "support.h"

using namespace tavrel;
using fuzz::require;

namespace {

struct Silence final : StandardStreams {
  void writeOutput(std::string_view) override {}
  void writeError(std::string_view) override {}
};

constexpr std::string_view kKeys[] = {"Services",
                                      "Services",
                                      "Hub",
                                      "Hub",
                                      "Generation",
                                      "Channels",
                                      "Class",
                                      "Class",
                                      "Name",
                                      "EntryID",
                                      "EntryID",
                                      "RetainCount",
                                      "Parents",
                                      "Properties",
                                      "Properties",
                                      "Methods",
                                      "Method",
                                      "Selector",
                                      "Flags",
                                      "Error",
                                      "OutputLength",
                                      "Output",
                                      "Scalars",
                                      "Request",
                                      "DriverID",
                                      "ChannelID",
                                      "Elements",
                                      "OpenError",
                                      "MapError",
                                      "MethodErrors",
                                      "0",
                                      "2",
                                      "3",
                                      "IOService",
                                      "IOReportLegend",
                                      "IOReportLegendPublic",
                                      "IOReportChannels",
                                      "IOReportGroupName"};

std::vector<RecordingPart> partsOf(fuzz::Input& input) {
  std::vector<RecordingPart> parts;
  if (input.byte() % 2 != 0) {
    fuzz::ValueReader values(input.bytes(), kKeys);
    parts.push_back({"made", values.dictionary(0)});
    parts.push_back({"made, too", values.dictionary(0)});
    return parts;
  }
  while (!input.empty() && parts.size() < 2) {
    const bool isBinary = input.text().starts_with("bplist");
    const std::string bytes = isBinary ? input.upTo(SIZE_MAX) : input.part();
    const auto value = plist::read(asBytes(bytes));
    parts.push_back({"read", value ? value->dictionary() : plist::Dictionary()});
  }
  return parts;
}

// Corrects the ids and the count in the elements of the hub's channels.
void mend(const plist::Dictionary& recording) {
  for (const plist::Value& value : recording.dictionary("Hub").array("Channels")) {
    plist::Dictionary channel = value.dictionary();
    const auto driver = channel.number("DriverID");
    const auto id = channel.number("ChannelID");
    const ByteSpan bytes = channel.data("Elements").bytes();
    if (!driver || !id || bytes.size() < kElementBytes) continue;
    const std::size_t count = bytes.size() / kElementBytes;
    std::vector<std::byte> elements(bytes.begin(),
                                    bytes.begin() + std::ptrdiff_t(count * kElementBytes));
    storeLittle64(elements, kElementDriver, static_cast<std::uint64_t>(driver->int64()));
    storeLittle64(elements, kElementChannel, static_cast<std::uint64_t>(id->int64()));
    storeLittle16(elements, kElementGroupCount, static_cast<std::uint16_t>(count));
    channel.set("Elements", plist::Data(elements));
  }
}

// Everything that a caller can ask of a service, except its properties, with the answers.
std::string ask(DriverService& service) {
  std::string said;
  std::uint64_t id = 0;
  said += std::to_string(service.entryID(id)) + ' ' + std::to_string(id);
  std::string name;
  said += ' ' + std::to_string(service.name(name)) + ' ' + name;
  require(name.size() <= 127 * 4);
  said += ' ' + std::to_string(service.userRetainCount());
  service.property("IOReportLegend");
  service.searchProperty("IOService", "vendor-name");

  std::unique_ptr<UserClient> client;
  if (service.open(0, client) != kKernelSuccess) return said;
  std::array<std::uint64_t, 1> scalar{};
  std::array<std::byte, 64> input{std::byte{13}};
  std::array<std::byte, 256> room{};
  for (const std::uint32_t method : {0U, 2U, 3U, 5U, 8U}) {
    for (const std::size_t outputs : {0U, 1U}) {
      std::size_t length = room.size() + 1;
      const auto code =
          client->callMethod(method, {}, input, std::span(scalar).first(outputs), room, length);
      said += ' ' + std::to_string(code);
      if (code != kKernelSuccess) continue;
      require(length <= room.size());
      said += ' ' + std::to_string(scalar[0]) + ' ';
      said += asText(ByteSpan(room).first(length));
    }
  }
  std::unique_ptr<MappedMemory> memory;
  client->mapMemory(1, memory);
  said += ' ' + std::to_string(client->close());
  require(client->close() != kKernelSuccess);
  return said;
}

std::string walk(DriverRegistry& registry, const plist::Dictionary& matching) {
  std::unique_ptr<ServiceIterator> services;
  require(registry.matchingServices(matching, services) == kKernelSuccess);
  std::string said;
  while (const auto service = services->next())
    said += ask(*service) + '\n';
  require(services->isValid());
  return said;
}

// The last samples; null when nothing could be subscribed.
plist::Dictionary sample(DriverRegistry& registry) {
  Silence streams;
  const plist::Dictionary channels = IOReportCopyAllChannels(registry, streams, 0, nullptr);
  plist::Dictionary subscribed;
  const auto subscription =
      IOReportCreateSubscription(registry, nullptr, channels, &subscribed, 0, nullptr);
  if (!subscription) return {};
  require(subscription->buffer().size() % kElementBytes == 0);
  plist::Dictionary earlier;
  for (int update = 0; update < 3; ++update) {
    const plist::Dictionary samples =
        IOReportCreateSamples(subscription.get(), subscribed, nullptr);
    IOReportIterate(samples, [](const plist::Dictionary& channel) {
      fuzz::examine(channel);
      return kIterateContinue;
    });
    if (earlier) IOReportCreateSamplesDelta(earlier, samples, nullptr);
    earlier = samples;
  }
  return earlier;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  const std::vector<RecordingPart> parts = partsOf(input);
  for (const RecordingPart& part : parts)
    mend(part.content);
  fuzz::SilentLog log;
  const Recording recording(parts, nullptr, log);
  for (const RecordedEntry& entry : recording.services())
    require(!entry.entryID || recording.serviceWithID(*entry.entryID) != nullptr);

  const plist::Dictionary merged = mergedRecording(parts);
  RecordedRegistry registry(merged, log);
  const std::string said = walk(registry, plist::Dictionary::create());
  require(static_cast<std::size_t>(std::ranges::count(said, '\n')) >= recording.services().size());
  walk(registry, {{"IOProviderClass", kReportHubClass}});
  const plist::Dictionary samples = sample(registry);

  RecordedRegistry again(registry.recording(), log);
  require(walk(again, plist::Dictionary::create()) == said);
  require(plist::Value(sample(again)) == plist::Value(samples));
  return 0;
}
