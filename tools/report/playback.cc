#include "tools/report/playback.h"

#include <algorithm>

#include "base/limits.h"
#include "ioreport/ioreport.h"
#include "ioreport/keys.h"

namespace tavrel {
namespace {

constexpr std::size_t kChannelBytes = 256;  // more than a channel takes besides its elements

// No less than one group of elements takes in the document, and enough for a full document to have
// no more values than a reader admits.
std::size_t textBytes(std::size_t elementBytes) {
  constexpr std::size_t kLeast = limits::kPropertyListBytes / limits::kPropertyListValues + 1;
  constexpr std::size_t kBytesPerLine = 57, kIndentAndEnd = 8, kTags = 32;
  const std::size_t lines = elementBytes / kBytesPerLine + 1;
  return std::max(kLeast, (elementBytes + 2) / 3 * 4 + lines * kIndentAndEnd + kTags);
}

}  // namespace

Playback::Key Playback::keyOf(const plist::Dictionary& channel) {
  return {IOReportChannelGetDriverID(channel), IOReportChannelGetChannelID(channel)};
}

bool Playback::add(const std::vector<plist::Dictionary>& sample) {
  std::size_t sampleBytes = sampleBytes_;
  std::size_t channels = groups_.size();
  for (const plist::Dictionary& channel : sample) {
    if (groups_.contains(keyOf(channel))) continue;
    sampleBytes += textBytes(channel.data(kRawElementsKey).size());
    ++channels;
  }
  if ((samples_ + 1) * sampleBytes + channels * kChannelBytes > bytes_) return false;
  sampleBytes_ = sampleBytes;
  for (const plist::Dictionary& channel : sample) {
    plist::Array& groups = groups_[keyOf(channel)];
    pad(groups);
    groups.append(channel.data(kRawElementsKey));
  }
  ++samples_;
  return true;
}

plist::Array Playback::channels() {
  plist::Array channels = plist::Array::create(groups_.size());
  for (auto& [key, groups] : groups_) {
    pad(groups);
    channels.append(
        plist::Dictionary{{"DriverID", key.first},
                          {"ChannelID", key.second},
                          {"Elements", groups.size() == 1 ? groups.at(0) : plist::Value(groups)}});
  }
  return channels;
}

void Playback::pad(plist::Array& groups) const {
  while (groups.size() < samples_)
    groups.append(plist::Data(ByteSpan()));
}

}  // namespace tavrel
