// Sources of residencies: how long a device was in each of its states, and how often it entered
// them.
#include <algorithm>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "base/ascii.h"
#include "base/limits.h"
#include "platform/linux/live/attribute_class.h"
#include "platform/linux/live/sources.h"
#include "platform/linux/live/text_table.h"

namespace tavrel::live {
namespace {

constexpr std::string_view kProcessors = "/sys/devices/system/cpu";
constexpr Scale kTicks{10, 1};  // of 10 ms

// The keys of the rows that begin with a number, in order.
std::vector<std::string> numberedRows(const std::string& path, const TableForm& form) {
  TextBuffer buffer;
  auto text = readKernelFile(path, ReadMode::Once, buffer);
  std::vector<std::string> keys;
  while (text && !text->empty() && keys.size() < limits::kLiveElements) {
    std::string_view line = takeLine(*text);
    const std::string_view key = keyOfLine(line, form);
    if (parseKernelNumber(key)) keys.emplace_back(key);
  }
  return keys;
}

// Takes the next field of a row whose fields have 10 characters and may touch; the last is the
// rest. Empty when it is shorter or does not end in a digit, as in rows of another width.
std::string_view takeField(std::string_view& line, bool isLast) {
  constexpr std::size_t kWidth = 10;
  const std::string_view field = isLast ? line : line.substr(0, kWidth);
  line.remove_prefix(field.size());
  return field.size() >= kWidth && isDigit(field.back()) ? field : std::string_view();
}

// A table "FROM: ENTRIES OF STATE 0, OF STATE 1 ..." whose rows, in the order of states, add up to
// the entries of states. With `hasTimes` a row ends in the time of its state. Such rows may have
// any width, except where figures touch: "%10u" leaves no blank before an entry or time of 10
// digits. The kernel cuts a large table to one page: sums of a part would be too low.
class TransitionReader final : public TextReader {
 public:
  TransitionReader(std::vector<std::string> states, TableForm form, bool hasTimes)
      : states_(std::move(states)), form_(form), hasTimes_(hasTimes) {}

  void read(std::string_view text, std::span<std::int64_t> slots) const override {
    // The line after the rows. In a part without it, entries might count as times.
    if (hasTimes_ && text.find("\nTotal") == std::string_view::npos) return;
    std::vector<std::int64_t> sums(slots.size());
    std::size_t rows = 0;
    while (!text.empty() && rows < states_.size()) {
      std::string_view line = takeLine(text);
      if (keyOfLine(line, form_) != states_[rows]) continue;
      if (line.starts_with(':')) line.remove_prefix(1);
      const bool hasFields = hasTimes_ && tokensIn(line, form_) <= states_.size();
      const auto add = [&](std::int64_t& sum, bool isLast) {
        const auto number = parseKernelNumber(hasFields ? takeField(line, isLast)
                                                        : takeToken(line, form_.separator));
        if (number) sum = saturatingSum(sum, *number);
        return number.has_value();
      };
      for (std::size_t i = 0; i < states_.size(); ++i) {
        if (!add(sums[i], false)) return;
      }
      if (hasTimes_ && !add(sums[states_.size() + rows], true)) return;
      if (tokensIn(line, form_) > 0) return;
      ++rows;
    }
    if (rows == states_.size()) std::ranges::copy(sums, slots.begin());
  }

 private:
  std::vector<std::string> states_;
  TableForm form_;
  bool hasTimes_;
};

std::unique_ptr<TableReader> timeReader(const std::vector<std::string>& states,
                                        const TableForm& form, Scale scale) {
  auto reader = std::make_unique<TableReader>(form, std::vector<Cell>{{1, 0, scale}});
  for (std::size_t i = 0; i < states.size(); ++i)
    reader->addRow(states[i], static_cast<std::uint32_t>(i));
  return reader;
}

// A device with a text of times, a text of transitions, and a file with the current state.
struct StateTable {
  std::string times;  // or the text of transitions again, when that has the times
  std::string transitions;
  std::string current;
  Speed currentSpeed;
  TableForm form;
  Scale scale;
  std::string (*nameOf)(std::int64_t number);
};

void addStateTable(const StateTable& table, const Place& place, const std::string& name,
                   LiveSource& source) {
  const std::vector<std::string> states = numberedRows(table.times, table.form);
  if (states.empty()) return;
  Residency residency;
  std::vector<std::string> names;
  for (const std::string& state : states) {
    residency.numbers.push_back(*parseKernelNumber(state));
    names.push_back(table.nameOf(residency.numbers.back()));
  }
  residency.ids = stateIDs(names);
  const auto count = static_cast<std::uint32_t>(states.size());
  const bool hasTimes = table.times == table.transitions;
  const std::uint32_t first = source.addTextFile(
      table.transitions, hasTimes ? 2 * count : count,
      std::make_unique<TransitionReader>(states, table.form, hasTimes), ReadMode::Once);
  if (!hasTimes) {
    source.addTextFile(table.times, count, timeReader(states, table.form, table.scale),
                       ReadMode::Once);
  }
  residency.currentSlot = source.addNumberFile(table.current, {}, table.currentSpeed);
  source.addStates(place, name, first, std::move(residency));
}

}  // namespace

void addCpuIdle(const DeviceRoot& root, LiveSource& source) {
  for (const NamedDevice& cpu :
       devicesIn(root, kProcessors, "cpu*", "", false, source, limits::kLiveProcessors)) {
    const std::string folder = cpu.path + "/cpuidle/state";
    std::vector<std::string> names;
    for (std::size_t i = 0; i < limits::kLiveElements; ++i) {
      std::string name = firstLine(folder + std::to_string(i) + "/name");
      if (name.empty()) break;
      names.push_back(std::move(name));
    }
    if (names.empty()) continue;
    std::uint32_t first = UINT32_MAX;
    for (const char* const file : {"/usage", "/time"}) {
      for (std::size_t i = 0; i < names.size(); ++i)
        first = std::min(first, source.addNumberFile(folder + std::to_string(i) + file));
    }
    source.addStates({"CPU Idle", cpu.name, kMicroseconds}, cpu.name + ".idle_states", first,
                     {.ids = stateIDs(names), .numbers = {}});
  }
}

void addCpuFrequency(const DeviceRoot& root, LiveSource& source) {
  const std::string folder = std::string(kProcessors) + "/cpufreq";
  for (const NamedDevice& policy :
       devicesIn(root, folder, "policy*", "", false, source, limits::kLiveProcessors)) {
    addStateTable({.times = policy.path + "/stats/time_in_state",
                   .transitions = policy.path + "/stats/trans_table",
                   .current = policy.path + "/scaling_cur_freq",
                   .currentSpeed = Speed::Quick,
                   .form = {},
                   .scale = kTicks,
                   .nameOf = frequencyName},
                  {"CPU Frequency", policy.name, kMilliseconds}, policy.name + ".frequency",
                  source);
    const std::string total = policy.path + "/stats/total_trans";
    if (!exists(total)) continue;
    source.addSimple({"CPU Frequency", policy.name, kEvents}, policy.name + ".frequency_changes",
                     source.addNumberFile(total));
  }
}

void addDeviceFrequency(const DeviceRoot& root, LiveSource& source) {
  for (const NamedDevice& device : devicesIn(root, "/sys/class/devfreq", "", "", false, source)) {
    addStateTable({.times = device.path + "/trans_stat",
                   .transitions = device.path + "/trans_stat",
                   .current = device.path + "/cur_freq",
                   .currentSpeed = Speed::Quick,
                   .form = {.mark = "*"},
                   .scale = {},
                   .nameOf = [](std::int64_t hertz) { return frequencyName(hertz / 1000); }},
                  {"Device Frequency", device.name, kMilliseconds}, device.name + ".frequency",
                  source);
  }
}

void addCooling(const DeviceRoot& root, LiveSource& source) {
  for (const NamedDevice& device :
       devicesIn(root, "/sys/class/thermal", "cooling_device", "type", false, source)) {
    const std::string stats = device.path + "/stats/";
    addStateTable({.times = stats + "time_in_state_ms",
                   .transitions = stats + "trans_table",
                   .current = device.path + "/cur_state",
                   .currentSpeed = Speed::Slow,
                   .form = {.mark = "state"},
                   .scale = {},
                   .nameOf = [](std::int64_t state) { return "state" + std::to_string(state); }},
                  {"Cooling", device.name, kMilliseconds}, device.name + ".cooling_states", source);
  }
}

}  // namespace tavrel::live
