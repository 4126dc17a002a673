// Interrupts and softirqs, as arrays by processor.
//
//              CPU0       CPU2
//    1:          9          0  IO-APIC   1-edge      i8042
//  NMI:          0          0  Non-maskable interrupts
//
// The columns are the processors that are online now; the heading names them.
#include <algorithm>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "base/ascii.h"
#include "base/format.h"
#include "base/keyed_hash.h"
#include "base/limits.h"
#include "platform/linux/live/sources.h"

namespace tavrel::live {
namespace {

// Counts of all handlers together. The heading names processors by number, so a short text could
// claim a place for each processor that the kernel can have.
constexpr std::size_t kLargestCounts = 1U << 20;

// The numbers of the processors in the heading.
std::vector<std::uint32_t> processorsIn(std::string_view heading) {
  std::vector<std::uint32_t> numbers;
  for (auto word = takeWord(heading); !word.empty(); word = takeWord(heading)) {
    if (!word.starts_with("CPU")) return {};
    const auto number = parseKernelNumber(word.substr(3));
    if (!number || *number < 0) return {};
    if (static_cast<std::uint64_t>(*number) >= limits::kLiveProcessors) return {};
    numbers.push_back(static_cast<std::uint32_t>(*number));
  }
  return numbers;
}

// "1" or "NMI"; empty for a line that is no row.
std::string_view keyOf(std::string_view& line) {
  const std::string_view word = takeWord(line);
  return word.ends_with(':') ? word.substr(0, word.size() - 1) : std::string_view();
}

// The handlers at the end of a row: "i8042", or "i801_smbus,PCIe_PME" for "i801_smbus, PCIe PME".
// Two blanks precede them. A row without handlers ends in the blanks that fill its last column.
std::string handlersIn(std::string_view line) {
  const std::size_t gap = line.rfind("  ");
  if (gap == std::string_view::npos || line.ends_with(' ')) return {};
  line.remove_prefix(gap);
  std::string handlers;
  bool isNext = true;  // the first word, or the first behind a comma
  for (auto word = takeWord(line); !word.empty(); word = takeWord(line)) {
    if (!isNext) handlers += '_';
    handlers += word;
    isNext = word.ends_with(',');
  }
  return handlers;
}

class InterruptReader final : public TextReader {
 public:
  explicit InterruptReader(std::uint32_t processors) : processors_(processors) {}

  void addRow(std::string key, std::uint32_t firstSlot) {
    rows_.emplace(std::move(key), firstSlot);
  }

  // Rows that share slots add up.
  void read(std::string_view text, std::span<std::int64_t> slots) const override {
    const std::vector<std::uint32_t> processors = processorsIn(takeLine(text));
    while (!text.empty()) {
      std::string_view line = takeLine(text);
      const auto row = rows_.find(keyOf(line));
      if (row == rows_.end()) continue;
      for (const std::uint32_t processor : processors) {
        const auto count = parseKernelNumber(takeWord(line));
        if (!count) break;
        const std::size_t slot = std::size_t{row->second} + processor;
        if (processor >= processors_ || slot >= slots.size()) continue;
        slots[slot] = slots[slot] == kUnset ? *count : saturatingSum(slots[slot], *count);
      }
    }
  }

 private:
  std::uint32_t processors_;
  std::unordered_map<std::string, std::uint32_t, KeyedHash, std::equal_to<>> rows_;
};

void addCounts(const std::string& path, const std::string& prefix, std::string_view group,
               LiveSource& source) {
  TextBuffer buffer;
  auto text = readKernelFile(path, ReadMode::ToEnd, buffer);
  if (!text) return;
  const std::vector<std::uint32_t> processors = processorsIn(takeLine(*text));
  if (processors.empty()) return;
  const std::uint32_t width = *std::max_element(processors.begin(), processors.end()) + 1;

  auto reader = std::make_unique<InterruptReader>(width);
  std::unordered_map<std::string, std::uint32_t> slots;
  std::vector<std::pair<std::string, std::uint32_t>> names;
  std::size_t rows = 0;
  while (!text->empty() && rows < limits::kLiveRows &&
         (slots.size() + 1) * width <= kLargestCounts) {
    std::string_view line = takeLine(*text);
    std::string key(keyOf(line));
    if (key.empty()) continue;
    std::string_view rest = line;
    for (std::size_t i = 0; i < processors.size(); ++i) {
      std::string_view ahead = rest;
      if (!parseKernelNumber(takeWord(ahead))) break;
      rest = ahead;
    }
    // Numbers of interrupts change from boot to boot, handlers do not.
    std::string name = parseKernelNumber(key) ? handlersIn(rest) : key;
    if (name.empty()) name = key;
    name = prefix + channelName(name);
    const auto [at, isNew] = slots.emplace(name, static_cast<std::uint32_t>(slots.size()) * width);
    if (isNew) names.emplace_back(name, at->second);
    reader->addRow(std::move(key), at->second);
    ++rows;
  }
  if (buffer.isCut() || !text->empty()) {
    source.note(format("%s: only the first %zu rows are shown", path, rows));
  }
  const std::uint32_t first = source.addTextFile(
      path, static_cast<std::uint32_t>(names.size()) * width, std::move(reader), ReadMode::ToEnd);
  for (auto& [name, slot] : names)
    source.addArray({"Interrupts", group, kEvents}, std::move(name), first + slot, width);
}

}  // namespace

void addInterrupts(const DeviceRoot& root, LiveSource& source) {
  addCounts(root.path("/proc/interrupts"), "irq.", "Hardware", source);
  addCounts(root.path("/proc/softirqs"), "softirq.", "Software", source);
}

}  // namespace tavrel::live
