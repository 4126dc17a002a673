#include <cstdint>
#include <iterator>
#include <memory>
#include <new>
#include <optional>
#include <string_view>
#include <vector>

#include "base/format.h"
#include "storage/counter_parsers.h"
#include "storage/structured_lists.h"
#include "storage/structured_record_type.h"
#include "storage/telemetry_counters.h"

namespace tavrel {
namespace {

constexpr std::int64_t kBlockBytes = kCounterBlockBytes;
constexpr std::int64_t kChannelRecordBytes = 32;

/// Longest text of a chip's identifier, in bytes, with its terminator.
constexpr std::int32_t kChipIDBytes = 64;

/// The fields of a channel record, 32 bits each; the last 4 bytes are ignored.
constexpr const char* kChannelFields[] = {"RD",  "PE",         "Max_PE_rate", "t0",
                                          "Ret", "block_type", "num_pages"};

/// A controller's characteristics that determine how to read its telemetry.
struct Controller {
  std::uint32_t generation;
  CounterParser parser;
  std::int32_t channels;
};

/// The text under a key; nothing, with a line that says why, when there is none.
std::optional<std::string_view> textUnder(const char* key, const plist::Dictionary& dictionary,
                                          StandardStreams& streams) {
  if (!dictionary.contains(key)) {
    streams.printError("ERROR: Could not determine the %s\n", key);
    return std::nullopt;
  }
  const auto text = dictionary.string(key);
  if (!text) streams.printError("ERROR: %s is not stored as a CFStringTypeID\n", key);
  return text;
}

std::optional<Controller> controllerOf(const plist::Value& characteristics,
                                       StandardStreams& streams) {
  const plist::Dictionary dictionary = characteristics.dictionary();
  if (!dictionary) {
    streams.writeError("ERROR: Could not parse the Device Characteristics dictionary\n");
    return std::nullopt;
  }
  const auto chipID = textUnder("chip-id", dictionary, streams);
  if (!chipID) return std::nullopt;
  if (chipID->size() >= kChipIDBytes) {
    streams.printError(
        "ERROR: Unable to obtain %s as conversion from the UniChar contents of CFString failed, "
        "or the buffer of %d bytes is too small\n",
        "chip-id", kChipIDBytes);
    return std::nullopt;
  }
  const auto manufacturerID = textUnder("manufacturer-id", dictionary, streams);
  if (!manufacturerID) return std::nullopt;
  const ManufacturerId manufacturer = readManufacturerId(streams, *manufacturerID);
  const auto channels = dictionary.number("num-bus");
  if (!channels) {
    streams.writeError("ERROR: could not determine the number of channels\n");
    return std::nullopt;
  }
  const std::uint32_t generation = chipGeneration(*chipID);
  return Controller{generation,
                    selectCounterParser(generation, manufacturer.vendor, manufacturer.device),
                    channels->int32()};
}

/// An array whose counters are part of a record.
struct ShownArray {
  CounterArray array;
  std::size_t counters;  // how many, from its beginning
};

std::vector<ShownArray> shownArrays(std::uint32_t generation) {
  using enum CounterArray;
  std::vector<ShownArray> shown{{readStage, generation == kGenerationK4 ? 33U : 23U},
                                {initialReadStage, 23},
                                {nandStageOfLife, 8},
                                {dspExceptionParameter, generation == kGenerationK4 ? 38U : 12U},
                                {readStage18NumOfErrorsBin, 12},
                                {readStage9NumOfErrorsBin, 10},
                                {readStage10NumOfErrorsBin, 10},
                                {readStage17NumOfErrorsBin, 10},
                                {readStage19NumOfErrorsBin, 12}};
  if (generation == kGenerationK3) shown.push_back({algoNANDAccessesBin, 8});
  if (generation == kGenerationK4) shown.push_back({retentionIndication, 12});
  return shown;
}

/// One counter of a record, and its place in `TelemetryCounters`.
struct Column {
  plist::String key;
  std::size_t element;
};

/// The keys are made once and shared by the records of all channels.
std::vector<Column> columnsOf(std::uint32_t generation) {
  std::vector<Column> columns;
  for (const auto& [array, counters] : shownArrays(generation)) {
    const CounterArrayShape& shape = shapeOf(array);
    for (std::size_t i = 0; i < counters; ++i)
      columns.push_back({format("%s[%zu]", shape.name, i), shape.first + i});
  }
  return columns;
}

}  // namespace

bool logTelemetryList(Platform& platform, ByteSpan buffer, const plist::Value& characteristics) {
  const std::unique_ptr<TelemetryCounters> counters(new (std::nothrow) TelemetryCounters());
  if (!counters) {
    platform.standardStreams->printError("ERROR: Could not malloc %zu bytes\n",
                                         sizeof(TelemetryCounters));
    return false;
  }
  const auto controller = controllerOf(characteristics, platform.standardStreams);
  if (!controller) return false;
  const std::int64_t channels = controller->channels;
  if (channels * (kBlockBytes + kChannelRecordBytes) > static_cast<std::int64_t>(buffer.size())) {
    platform.standardStreams->writeError(
        "ERROR: Attempting to parse beyond the bounds of the buffer\n");
    return false;
  }

  const std::vector<Column> columns = columnsOf(controller->generation);
  for (std::int64_t channel = 0; channel < channels; ++channel) {
    const auto blockAt = static_cast<std::size_t>(channel * kBlockBytes);
    const auto recordAt =
        static_cast<std::uint64_t>(channels * kBlockBytes + channel * kChannelRecordBytes);
    controller->parser(CounterBlock(buffer.subspan(blockAt).first<kBlockBytes>()), *counters);

    plist::Dictionary record =
        plist::Dictionary::create(std::size(kChannelFields) + columns.size());
    std::uint64_t offset = recordAt;
    for (const char* field : kChannelFields) {
      record.set(field, static_cast<std::int32_t>(*loadLittle32(buffer, offset)));
      offset += sizeof(std::uint32_t);
    }
    for (const Column& column : columns)
      record.set(column.key, static_cast<std::int32_t>(counters->elements[column.element]));
    platform.crashReporting->FLLogStructuredData(kStorageRecordType, record);
  }
  return true;
}

}  // namespace tavrel
