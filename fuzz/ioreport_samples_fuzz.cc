// Arbitrary aggregates and a raw buffer: samples, their deltas, all queries on channels, pruning
// and merging. Samples must have whole elements and leave the channels unchanged, and the delta of
// a sample with itself must not have more channels than the sample.
//
// Input: two aggregates, the buffer.
#include "ioreport/elements.h"
#include "reporting_values.h"

namespace {

using namespace tavrel;
using plist::Dictionary;

void examineAll(const Dictionary& aggregate) {
  IOReportIterate(aggregate, [](const Dictionary& channel) {
    fuzz::examine(channel);
    return kIterateContinue;
  });
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::ValueReader reader(std::as_bytes(std::span(data, size)));
  const Dictionary first = reader.dictionary(0);
  const Dictionary second = reader.dictionary(0);

  const plist::Value before = plist::deepCopy(first);
  const Dictionary samples = IOReportCreateSamplesRaw(first, reader.rest(), nullptr);
  const Dictionary delta = IOReportCreateSamplesDelta(second, first, nullptr);
  fuzz::require(before == plist::Value(first));
  const std::int32_t count = IOReportGetChannelCount(first);
  fuzz::require(!samples || IOReportGetChannelCount(samples) <= count);
  fuzz::require(!delta || IOReportGetChannelCount(delta) == count);
  IOReportIterate(samples, [](const Dictionary& channel) {
    const std::size_t bytes = channel.data("RawElements").size();
    fuzz::require(bytes >= kElementBytes && bytes % kElementBytes == 0);
    return kIterateContinue;
  });

  for (const Dictionary& aggregate : {first, second, samples, delta})
    examineAll(aggregate);
  const Dictionary twice = IOReportCreateSamplesDelta(samples, samples, nullptr);
  fuzz::require(!twice || IOReportGetChannelCount(twice) == IOReportGetChannelCount(samples));
  examineAll(twice);

  const auto first0 = first.array("IOReportChannels").at(0).dictionary();
  const auto second0 = second.array("IOReportChannels").at(0).dictionary();
  examineAll(Dictionary{
      {"IOReportChannels", plist::Array{IOReportSampleCreateDelta(first0, second0, nullptr)}}});

  IOReportMergeChannels(first, second, nullptr);
  const bool isPruned =
      IOReportPrune(first, [](const Dictionary&) { return kIterateRemove; }) == kIterateRemove;
  fuzz::require(!isPruned || IOReportGetChannelCount(first) <= 0);
  return 0;
}
