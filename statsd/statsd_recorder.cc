#include "statsd/statsd_recorder.h"

#include <algorithm>
#include <cmath>

#include "base/arithmetic.h"
#include "base/ascii.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

constexpr std::size_t kLongestPrefix = 200;

// At most this many copies of a line's measurements are recorded, unless the line has more values.
// One line must not let a sender fill the segment; no client samples more sparsely than this.
constexpr double kMostCopies = 1000;

constexpr const char* kFaultNames[] = {"malformed", "unsupported", "refused", "too_long"};

constexpr bool isKeyCharacter(char character) {
  return isLetterOrDigit(character) || character == '.' || character == '_' || character == '-';
}

// Some clients end lines with "\r\n".
std::string_view withoutBlanksAtEnd(std::string_view line) {
  while (line.ends_with(' ') || line.ends_with('\t') || line.ends_with('\r'))
    line.remove_suffix(1);
  return line;
}

// Returns the whole part of `value` and keeps the rest in `remainder`. A sum that lies only a
// rounding error below a whole number, as ten times 0.1 may, counts as that number.
std::int64_t takeWhole(double value, double& remainder) {
  constexpr double kRoundingError = 1e-9;
  const double sum = value + remainder;
  const double whole = std::floor(sum + kRoundingError);
  remainder = sum - whole;
  return saturatingInt64(whole);
}

}  // namespace

void appendStatsdKey(std::string& key, std::string_view name) {
  for (const char character : name)
    key += isKeyCharacter(character) ? character : '_';
}

bool isStatsdPrefix(std::string_view text) {
  return text.size() <= kLongestPrefix && std::ranges::all_of(text, isKeyCharacter);
}

StatsdRecorder::StatsdRecorder(std::string prefix)
    : prefix_(std::move(prefix)), keysLeft_(kBHKeys), nameBytesLeft_(kBHNamesBytes) {
  for (std::size_t i = 0; i < faults_.size(); ++i) {
    const std::string key = prefix_ + "tavrel-statsd." + kFaultNames[i];
    faults_[i] = BHClientScalarForKey(key.c_str());
    --keysLeft_;
    nameBytesLeft_ -= key.size();
  }
}

void StatsdRecorder::take(std::string_view datagram) {
  while (!datagram.empty()) {
    const std::size_t end = std::min(datagram.find('\n'), datagram.size());
    if (const auto line = withoutBlanksAtEnd(datagram.substr(0, end)); !line.empty())
      takeLine(line);
    datagram.remove_prefix(std::min(end + 1, datagram.size()));
  }
}

void StatsdRecorder::count(StatsdFault fault) const {
  BHClientScalarAdd(faults_[static_cast<std::size_t>(fault)], 1);
}

void StatsdRecorder::takeLine(std::string_view text) {
  switch (parseStatsdLine(text, line_)) {
    case StatsdParse::Good:
      if (!record(line_)) count(StatsdFault::Refused);
      return;
    case StatsdParse::Malformed:
      return count(StatsdFault::Malformed);
    case StatsdParse::Unsupported:
      return count(StatsdFault::Unsupported);
  }
}

bool StatsdRecorder::record(const StatsdLine& line) {
  Key* const key = find(line.kind == StatsdKind::Series ? series_ : scalars_, line.name);
  if (key == nullptr) return false;
  const double mostCopies = std::max(1.0, kMostCopies / static_cast<double>(line.values.size()));
  const double rate = line.kind == StatsdKind::Counter ? line.rate : 1;
  const auto wholeOf = [&](const StatsdValue& value) {
    return value.whole ? *value.whole : takeWhole(value.number / rate, key->remainder);
  };
  for (const StatsdValue& value : line.values) {
    switch (line.kind) {
      case StatsdKind::Counter:
      case StatsdKind::GaugeDelta:
        BHClientScalarAdd(key->scalar, wholeOf(value));
        break;
      case StatsdKind::Gauge:
        key->remainder = 0;
        BHClientScalarSet(key->scalar, wholeOf(value));
        break;
      case StatsdKind::Series: {
        const double copies = std::min(1 / line.rate, mostCopies);
        for (std::int64_t left = takeWhole(copies, key->remainder); left > 0; --left)
          BHClientDistributionRecord(key->series, value.number);
        break;
      }
    }
  }
  return true;
}

// Null when the library would refuse the key.
StatsdRecorder::Key* StatsdRecorder::find(Keys& keys, std::string_view name) {
  if (prefix_.size() + name.size() > kBHLongestName) return nullptr;
  name_.assign(prefix_);
  appendStatsdKey(name_, name);
  if (const auto known = keys.find(std::string_view(name_)); known != keys.end())
    return &known->second;
  if (keysLeft_ == 0 || nameBytesLeft_ < name_.size()) {
    isOutOfKeys_ = true;
    return nullptr;
  }
  --keysLeft_;
  nameBytesLeft_ -= name_.size();
  Key key;
  if (&keys == &series_) {
    key.series = BHClientDistributionForKey(name_.c_str());
  } else {
    key.scalar = BHClientScalarForKey(name_.c_str());
  }
  return &keys.emplace(name_, key).first->second;
}

}  // namespace tavrel
