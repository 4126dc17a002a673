// What the top-level slices of the unified hierarchy of control groups use.
#include <array>
#include <memory>
#include <set>
#include <string>
#include <string_view>

#include "platform/linux/live/attribute_class.h"
#include "platform/linux/live/sources.h"
#include "platform/linux/live/text_table.h"

namespace tavrel::live {
namespace {

constexpr Figure kCpu[] = {
    {"usage_usec", 1, "cpu", kMicroseconds},
    {"user_usec", 1, "cpu_user", kMicroseconds},
    {"system_usec", 1, "cpu_system", kMicroseconds},
    {"nr_throttled", 1, "cpu_throttles", kEvents},
    {"throttled_usec", 1, "cpu_throttled", kMicroseconds},
};
constexpr Figure kMemoryEvents[] = {
    {"high", 1, "memory_high", kEvents},
    {"max", 1, "memory_max", kEvents},
    {"oom", 1, "memory_oom", kEvents},
    {"oom_kill", 1, "memory_oom_kills", kEvents},
};
// "some avg10=0.00 avg60=0.00 avg300=0.00 total=0"
constexpr TableForm kPressureForm{.separator = '='};
constexpr Figure kPressure[] = {
    {"some", 8, "pressure_some", kMicroseconds},
    {"full", 8, "pressure_full", kMicroseconds},
};
constexpr Attribute kAttributes[] = {
    {"memory.current", "memory", kBytes},
    {"memory.peak", "memory_peak", kBytes},
    {"memory.swap.current", "memory_swap", kBytes},
    {"pids.current", "processes", kPlain},
};

struct IoFigure {
  std::string_view key;
  std::string_view name;
  Unit unit;
};
constexpr std::array kIo{
    IoFigure{"rbytes", "io_read_bytes", kBytes},
    IoFigure{"wbytes", "io_written_bytes", kBytes},
    IoFigure{"rios", "io_reads", kEvents},
    IoFigure{"wios", "io_writes", kEvents},
};

using DiskNumbers = std::set<std::string, std::less<>>;  // "8:0"

// The disks that are devices. Mappings and loops pass their I/O on to these, where it counts again.
// Unlike `isOwnDevice`, this includes NVMe disks with several paths: paths have no number.
DiskNumbers deviceNumbers(const DeviceRoot& root, LiveSource& source) {
  DiskNumbers numbers;
  for (const std::string& name : source.namesIn(root.path("/sys/block"))) {
    const std::string disk = root.path("/sys/block/" + name);
    if (exists(disk + "/device")) numbers.insert(firstLine(disk + "/dev"));
  }
  return numbers;
}

// Reads "8:0 rbytes=1 wbytes=2 rios=3 wios=4 dbytes=5 dios=6", and adds up the figures of devices.
// A disk without I/O may have only its name there, with or without an end of the line.
class IoReader final : public TextReader {
 public:
  explicit IoReader(std::shared_ptr<const DiskNumbers> disks) : disks_(std::move(disks)) {}

  void read(std::string_view text, std::span<std::int64_t> slots) const override {
    bool isDevice = false;
    for (auto word = takeWord(text); !word.empty(); word = takeWord(text)) {
      const std::size_t equals = word.find('=');
      if (equals == std::string_view::npos) {
        isDevice = disks_->contains(word);
        continue;
      }
      const auto value = parseKernelNumber(word.substr(equals + 1));
      if (!isDevice || !value) continue;
      for (std::size_t i = 0; i < kIo.size(); ++i) {
        if (kIo[i].key != word.substr(0, equals)) continue;
        slots[i] = slots[i] == kUnset ? *value : saturatingSum(slots[i], *value);
      }
    }
  }

 private:
  const std::shared_ptr<const DiskNumbers> disks_;
};

// Publishes those figures that the text contains now.
void addIo(const std::string& path, const NamedDevice& slice,
           std::shared_ptr<const DiskNumbers> disks, LiveSource& source) {
  TextBuffer buffer;
  const auto text = readKernelFile(path, ReadMode::Once, buffer);
  if (!text) return;
  auto reader = std::make_unique<IoReader>(std::move(disks));
  std::array<std::int64_t, kIo.size()> now;
  now.fill(kUnset);
  reader->read(*text, now);
  const std::uint32_t first =
      source.addTextFile(path, kIo.size(), std::move(reader), ReadMode::Once);
  for (std::uint32_t i = 0; i < kIo.size(); ++i) {
    if (now[i] == kUnset) continue;
    source.addSimple({"Control Groups", slice.name, kIo[i].unit},
                     slice.name + '.' + std::string(kIo[i].name), first + i);
  }
}

}  // namespace

void addControlGroups(const DeviceRoot& root, LiveSource& source) {
  const bool isUnified = exists(root.path("/sys/fs/cgroup/cgroup.controllers"));
  const char* const folder = isUnified ? "/sys/fs/cgroup" : "/sys/fs/cgroup/unified";
  const auto disks = std::make_shared<const DiskNumbers>(deviceNumbers(root, source));
  for (const NamedDevice& slice : devicesIn(root, folder, "", "", false, source)) {
    if (!exists(slice.path + "/cgroup.events")) continue;
    const std::string prefix = slice.name + '.';
    const std::string_view group = "Control Groups";
    const auto add = [&](const std::string& file, std::span<const Figure> figures,
                         const std::string& names, const TableForm& form = {}) {
      addFigures(slice.path + '/' + file,
                 {.group = group,
                  .subGroup = slice.name,
                  .prefix = names,
                  .figures = figures,
                  .form = form},
                 source);
    };
    add("cpu.stat", kCpu, prefix);
    add("memory.events", kMemoryEvents, prefix);
    addIo(slice.path + "/io.stat", slice, disks, source);
    for (const char* const resource : {"cpu", "memory", "io", "irq"}) {
      const std::string name(resource);
      const std::span<const Figure> figures(kPressure);
      add(name + ".pressure", name == "irq" ? figures.last(1) : figures, prefix + name + '_',
          kPressureForm);
    }
    addAttributes(slice.path, {group, slice.name, kPlain}, prefix, kAttributes, Speed::Quick,
                  source);
  }
}

}  // namespace tavrel::live
