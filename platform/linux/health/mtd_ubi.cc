#include "platform/linux/health/mtd_ubi.h"

#include "platform/linux/health/sysfs.h"

namespace tavrel::health {
namespace {

constexpr FigureKind kMtd[] = {
    {"page_size", kBytes, Resets::NotACounter, "writesize", "smallest unit of writing"},
    {"block_size", kBytes, Resets::NotACounter, "erasesize", "smallest unit of erasing"},
    {"bad_blocks", kEvents, Resets::NotACounter, "bad_blocks", "factory and grown bad blocks"},
    {"reserved_blocks", kEvents, Resets::NotACounter, "bbt_blocks",
     "blocks that hold the table of bad blocks"},
    {"ecc_failures", kEvents, Resets::OnAttach, "ecc_failures", "uncorrectable reads"},
    {"corrected_bits", kEvents, Resets::OnAttach, "corrected_bits", "bits corrected"},
};
constexpr FigureKind kUbi[] = {
    {"erases_max", kEvents, Resets::Never, "max_ec", "erasures of the most used block"},
    {"bad_blocks", kEvents, Resets::NotACounter, "bad_peb_count", "bad physical blocks"},
    {"bad_block_reserve", kEvents, Resets::NotACounter, "reserved_for_bad",
     "blocks kept for those that go bad"},
    {"blocks", kEvents, Resets::NotACounter, "total_eraseblocks", "logical blocks"},
    {"free_blocks", kEvents, Resets::NotACounter, "avail_eraseblocks",
     "logical blocks not allocated"},
};

}  // namespace

std::span<const FigureKind> mtdKinds() {
  return kMtd;
}
std::span<const FigureKind> ubiKinds() {
  return kUbi;
}

Figures attributeFigures(const std::string& folder, std::span<const FigureKind> kinds) {
  Figures figures;
  for (const FigureKind& kind : kinds) {
    const auto value = readNumber(folder + '/' + std::string(kind.source));
    if (value) figures.push_back({&kind, *value});
  }
  return figures;
}

}  // namespace tavrel::health
