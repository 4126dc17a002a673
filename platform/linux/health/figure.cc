#include "platform/linux/health/figure.h"

#include <array>

#include "platform/linux/health/ata_smart.h"
#include "platform/linux/health/flash_life.h"
#include "platform/linux/health/mtd_ubi.h"
#include "platform/linux/health/nvme_logs.h"

namespace tavrel::health {

std::string_view nameOf(DriveKind kind) {
  static constexpr std::array<std::string_view, 6> kNames = {"nvme", "emmc", "ufs",
                                                             "ata",  "mtd",  "ubi"};
  return kNames[static_cast<std::size_t>(kind)];
}

const std::int64_t* valueOf(const Figures& figures, std::string_view name) {
  for (const Figure& figure : figures) {
    if (figure.kind->name == name) return &figure.value;
  }
  return nullptr;
}

const FigureKind* figureKind(DriveKind drive, std::string_view name) {
  std::array<std::span<const FigureKind>, 3> tables;
  switch (drive) {
    case DriveKind::Nvme:
      tables = {nvmeSmartKinds(), nvmeOcpKinds(), nvmeDerivedKinds()};
      break;
    case DriveKind::Emmc:
      tables = {emmcKinds()};
      break;
    case DriveKind::Ufs:
      tables = {ufsKinds()};
      break;
    case DriveKind::Ata:
      tables = {ataKinds()};
      break;
    case DriveKind::Mtd:
      tables = {mtdKinds()};
      break;
    case DriveKind::Ubi:
      tables = {ubiKinds()};
      break;
  }
  for (const auto table : tables) {
    for (const FigureKind& kind : table) {
      if (kind.name == name) return &kind;
    }
  }
  return nullptr;
}

}  // namespace tavrel::health
