#include "ioreport/state_values.h"

#include <limits>

#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "ioreport/keys.h"

namespace tavrel {
namespace {

constexpr double kNotANumber = std::numeric_limits<double>::quiet_NaN();

// The names that the states' IDs spell; an empty handle when one of the states has none.
plist::Array spelledNames(const Elements& states) {
  if (!states) return {};
  plist::Array names = plist::Array::create(states.count());
  for (std::size_t i = 0; i < states.count(); ++i) {
    const std::int64_t id = states.value(i, kStateID);
    const auto name = _copyPrintableIDString(static_cast<std::uint64_t>(id));
    if (id == kInvalidValue || !name) return {};
    names.append(*name);
  }
  return names;
}

}  // namespace

std::int32_t IOReportStateGetCount(const plist::Dictionary& channel) {
  return elementCountFor(channel, kFormatState);
}

std::int64_t IOReportStateGetIDForIndex(const plist::Dictionary& channel, std::int32_t index) {
  return elementValue(channel, kFormatState, index, kStateID);
}

std::int32_t IOReportStateGetIndexForID(const plist::Dictionary& channel, std::int64_t stateID) {
  const Elements states = elementsOfType(channel, kFormatState);
  for (std::size_t i = states.count(); i-- > 0;) {
    if (states.value(i, kStateID) == stateID) return static_cast<std::int32_t>(i);
  }
  return -1;
}

plist::Array stateNames(const plist::Dictionary& channel) {
  return madeOrNull([&] {
    if (channel && !channel.contains(kStateNamesKey)) {
      plist::Dictionary(channel).set(kStateNamesKey,
                                     spelledNames(elementsOfType(channel, kFormatState)));
    }
    return channel.array(kStateNamesKey);
  });
}

std::optional<std::string_view> IOReportStateGetNameForIndex(const plist::Dictionary& channel,
                                                             std::int32_t index) {
  const plist::Array names = stateNames(channel);
  if (index < 0 || static_cast<std::size_t>(index) >= names.size()) return std::nullopt;
  return names.begin()[index].string();
}

std::int64_t IOReportStateGetInTransitions(const plist::Dictionary& channel, std::int32_t index) {
  return elementValue(channel, kFormatState, index, kStateInTransitions);
}

std::int64_t IOReportStateGetResidency(const plist::Dictionary& channel, std::int32_t index) {
  return elementValue(channel, kFormatState, index, kStateResidency);
}

std::uint64_t totalResidency(const Elements& states) {
  std::uint64_t total = 0;
  for (std::size_t i = 0; i < states.count(); ++i)
    total += static_cast<std::uint64_t>(states.value(i, kStateResidency));
  return total;
}

double dutyCycle(const Elements& states, std::size_t index, std::uint64_t total) {
  if (total == 0) return kNotANumber;
  const auto residency = static_cast<std::uint64_t>(states.value(index, kStateResidency));
  return static_cast<double>(residency) / static_cast<double>(total);
}

double IOReportStateGetDutyCycle(const plist::Dictionary& channel, std::int32_t index) {
  const Elements states = elementsOfType(channel, kFormatState);
  if (index < 0 || static_cast<std::size_t>(index) >= states.count()) return kNotANumber;
  return dutyCycle(states, static_cast<std::size_t>(index), totalResidency(states));
}

std::int32_t IOReportStateGetCurrent(const plist::Dictionary& channel) {
  const Elements states = elementsOfType(channel, kFormatState);
  std::int32_t current = -1;
  std::uint64_t latest = 0;
  for (std::size_t i = 0; i < states.count(); ++i) {
    if (states.timestamp(i) <= latest) continue;
    latest = states.timestamp(i);
    current = static_cast<std::int32_t>(i);
  }
  return current;
}

}  // namespace tavrel
