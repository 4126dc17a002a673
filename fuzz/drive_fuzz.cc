// A machine whose drives give arbitrary answers: attributes in sysfs, log pages, registers and
// SMART data. A reading must say what it was read from or why there is none, labels must be
// printable, and whatever was written must read back.
//
// Input: a byte that chooses SMART data alone or the machine, which drives it lacks, and on how
// many days they are read, rather than only found; then the attributes of the SMART data, or
// numbers of attributes with their contents, each followed by 0xFF, and finally the drives' answer.
#include <algorithm>
#include <dlfcn.h>
#include <optional>
#include <regex.h>
#include <unordered_map>
#include <vector>

#include "memory_tree.h"
#include "platform/linux/health/ata_smart.h"
#include "platform/linux/health/reader.h"
#include "platform/linux/health/verdict.h"
#include "support.h"

using namespace tavrel;
using namespace tavrel::health;
using fuzz::require;

namespace {

constexpr std::string_view kAttributes[] = {"/sys/class/nvme/nvme0/model",
                                            "/sys/class/nvme/nvme0/firmware_rev",
                                            "/sys/class/nvme/nvme0/serial",
                                            "/sys/class/nvme/nvme0/nvme0n1/size",
                                            "/sys/block/mmcblk0/device/type",
                                            "/sys/block/mmcblk0/device/name",
                                            "/sys/block/mmcblk0/device/life_time",
                                            "/sys/block/mmcblk0/device/pre_eol_info",
                                            "/sys/block/mmcblk0/size",
                                            "/sys/block/sda/device/vendor",
                                            "/sys/block/sda/device/model",
                                            "/sys/block/sda/device/vpd_pg80",
                                            "/sys/block/sda/size",
                                            "/sys/block/sda/device/power/runtime_status",
                                            "/sys/class/mtd/mtd0/name",
                                            "/sys/class/mtd/mtd0/size",
                                            "/sys/class/mtd/mtd0/ecc_failures",
                                            "/sys/class/ubi/ubi0/max_ec",
                                            "/sys/class/ubi/ubi0/total_eraseblocks",
                                            "/sys/class/ubi/ubi0/eraseblock_size",
                                            "/sys/class/ubi/ubi0/mtd_num",
                                            "/proc/sys/kernel/random/boot_id",
                                            "/var/lib/tavrel/health/memory.plist"};

class Answers final : public DeviceCommands {
 public:
  explicit Answers(std::string answer) : answer_(std::move(answer)) {}
  Expected<Bytes> nvmeLog(const std::string&, std::uint8_t) override { return of(512); }
  Expected<Bytes> extCsd(const std::string&) override { return of(512); }
  Expected<Bytes> ataSmart(const std::string&) override { return of(answer_.size()); }

 private:
  Expected<Bytes> of(std::size_t size) const {
    if (answer_.empty()) return Error{"cannot read the drive"};
    const ByteSpan bytes = asBytes(answer_);
    Bytes made(bytes.begin(), bytes.end());
    made.resize(size);
    return made;
  }
  std::string answer_;
};

// In libatasmart's format: the disk supports SMART, is healthy, and has these attributes.
std::string smartData(std::string_view attributes) {
  std::string blob;
  const auto add = [&](std::string_view tag, std::string part, std::size_t size) {
    part.resize(size);
    blob += tag;
    for (const unsigned shift : {24U, 16U, 8U, 0U})
      blob += static_cast<char>(size >> shift);
    blob += part;
  };
  std::string identify(512, '\0');
  identify[164] = 1;
  identify[170] = 1;
  add("IDFY", identify, 512);
  add("SMST", std::string("\0\0\0\1", 4), 4);
  const std::string version(2, '\0');
  add("SMDT", version + std::string(attributes.substr(0, 360)), 512);
  add("SMTH",
      version + std::string(attributes.substr(std::min<std::size_t>(attributes.size(), 360))), 512);
  return blob;
}

void readSmart(std::string_view blob) {
  auto figures = ataFigures(asBytes(blob));
  if (!figures) return require(!figures.error().message.empty());
  for (const Figure& figure : *figures)
    require(figure.value >= 0);
  Reading reading;
  reading.figures = *std::move(figures);
  judge(reading, 0, "");
  figuresOf({reading});
}

void checkLabels(const Drive& drive) {
  for (const std::string& label : {drive.model, drive.firmware, drive.serial}) {
    require(label.size() <= 64);
    for (const char c : label)
      require(c >= ' ' && c <= '~');
  }
  require(!drive.capacity || *drive.capacity >= 0);
}

void readDrives(fuzz::Tree& tree, std::string_view answer, int days) {
  fuzz::SilentLog log;
  FileSystem files;
  Answers answers{std::string(answer)};
  HealthReader reader(tree.root, files, answers, log);
  for (int day = 0; day < days; ++day) {
    require(reader.readAll(1'700'000'000 + day * 86'400));
    const Readings readings = loadReadings(tree.root, files);
    const auto drives = findDrives(Machine(tree.root));
    require(readings.faults.empty() && drives && readings.readings.size() == drives->size());
    for (const Reading& reading : readings.readings)
      require(!reading.from.empty() || !reading.error.empty());
  }
}

void useMachine(fuzz::Input& input, unsigned choice) {
  fuzz::Tree tree;
  if (choice % 2 == 0) tree.write("/sys/block/mmcblk0/device/type", "MMC");
  if (choice / 2 % 2 == 0) tree.write("/sys/block/sda/device/vendor", "ATA");
  for (int i = 0; i < 4 && !input.empty(); ++i) {
    const std::string_view path = kAttributes[input.byte() % std::size(kAttributes)];
    tree.write(path, input.part());
  }
  // Reading a drive takes longer than finding it.
  if (const unsigned days = choice / 4 % 4; days > 0) {
    readDrives(tree, input.text(), days == 3 ? 2 : 1);
  } else {
    const auto drives = findDrives(Machine(tree.root));
    require(static_cast<bool>(drives));
    std::ranges::for_each(*drives, checkLabels);
  }
}

}  // namespace

// For each drive that it opens, libatasmart compiles the names of drives with quirks again, which
// would take longer than everything else. This keeps the compiled patterns. They are literals, so
// their addresses find them.
extern "C" int regcomp(regex_t* made, const char* pattern, int flags) {
  static auto& known = *new std::unordered_map<const char*, regex_t>;
  const auto [at, isNew] = known.try_emplace(pattern);
  if (isNew) {
    const auto compile = reinterpret_cast<decltype(&regcomp)>(dlsym(RTLD_NEXT, "regcomp"));
    require(compile(&at->second, pattern, flags) == 0);
  }
  *made = at->second;
  return 0;
}
extern "C" void regfree(regex_t*) {}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  const unsigned choice = input.byte();
  switch (choice % 4) {
    case 0:
      readSmart(input.text());
      break;
    case 1:
      readSmart(smartData(input.text()));
      break;
    default:
      useMachine(input, choice / 4);
  }
  return 0;
}
