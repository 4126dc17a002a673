#include "platform/linux/health/reading.h"

#include <algorithm>

#include "base/format.h"
#include "base/instant.h"
#include "base/limits.h"
#include "platform/plist/coding.h"
#include "platform/plist/xml.h"

namespace tavrel::health {
namespace {

constexpr std::int64_t kReadingVersion = 1;
constexpr std::string_view kSuffix = ".plist";

plist::Dictionary encode(const Figures& figures) {
  auto dictionary = plist::Dictionary::create(figures.size());
  for (const Figure& figure : figures)
    dictionary.set(figure.kind->name, figure.value);
  return dictionary;
}

Figures decodeFigures(DriveKind drive, const plist::Dictionary& dictionary) {
  Figures figures;
  for (const plist::Entry& entry : dictionary) {
    const FigureKind* const kind = figureKind(drive, entry.key.view());
    const auto number = entry.value.number();
    if (kind != nullptr && number) figures.push_back({kind, number->int64()});
  }
  return figures;
}

std::optional<DriveKind> kindNamed(std::string_view name) {
  for (const DriveKind kind : {DriveKind::Nvme, DriveKind::Emmc, DriveKind::Ufs, DriveKind::Ata,
                               DriveKind::Mtd, DriveKind::Ubi}) {
    if (nameOf(kind) == name) return kind;
  }
  return std::nullopt;
}

}  // namespace

Reading emptyReading(const Drive& drive) {
  Reading reading;
  reading.name = drive.name;
  reading.kind = drive.kind;
  reading.model = drive.model;
  reading.firmware = drive.firmware;
  reading.capacity = drive.capacity;
  return reading;
}

Expected<std::string> encodeReading(const Reading& reading) {
  plist::Dictionary document = {{"version", kReadingVersion},
                                {"name", reading.name},
                                {"kind", nameOf(reading.kind)},
                                {"model", reading.model},
                                {"firmware", reading.firmware},
                                {"boot", reading.boot},
                                {"time", plist::Date::since1970(static_cast<double>(reading.time))},
                                {"from", reading.from},
                                {"figures", encode(reading.figures)},
                                {"growth", encode(reading.growth)}};
  if (reading.capacity) document.set("capacity", *reading.capacity);
  if (!reading.error.empty()) document.set("error", reading.error);
  return plist::writeXml(document);
}

Expected<Reading> decodeReading(ByteSpan bytes) {
  const auto value = plist::read(bytes);
  if (!value) return value.error();
  const plist::Dictionary document = value->dictionary();
  const auto version = document.number("version");
  if (!version || version->int64() != kReadingVersion) return Error{"not a reading of version 1"};
  const auto name = document.string("name");
  const auto kind = kindNamed(document.string("kind").value_or(""));
  const auto time = document.date("time");
  if (!name || !kind || !time) return Error{"a reading without its name, kind or time"};
  const auto text = [&](std::string_view key) {
    return std::string(document.string(key).value_or(""));
  };
  Reading reading;
  reading.name = *name;
  reading.kind = *kind;
  reading.model = text("model");
  reading.firmware = text("firmware");
  if (const auto capacity = document.number("capacity")) reading.capacity = capacity->int64();
  reading.time = std::max<std::int64_t>(wholeSeconds(*time), 0);
  reading.boot = text("boot");
  reading.from = text("from");
  reading.error = text("error");
  reading.figures = decodeFigures(*kind, document.dictionary("figures"));
  reading.growth = decodeFigures(*kind, document.dictionary("growth"));
  return reading;
}

Readings loadReadings(const DeviceRoot& root, FileSystem& files) {
  Readings loaded;
  const std::string folder = root.path(kReadingsFolder);
  const auto names = files.list(folder);
  if (!names) {
    loaded.faults.push_back(names.error());
    return loaded;
  }
  for (const std::string& name : *names) {
    if (!name.ends_with(kSuffix)) continue;
    const std::string path = folder + '/' + name;
    const auto content = files.readIfPresent(path, limits::kReadingBytes);
    if (!content) {
      loaded.faults.push_back(content.error());
      continue;
    }
    if (!*content) continue;  // the drive has just gone
    auto reading = decodeReading(asBytes(**content));
    if (!reading || reading->name + std::string(kSuffix) != name) {
      const std::string_view fault =
          reading ? std::string_view("of another drive") : reading.error().message;
      loaded.faults.push_back({format("cannot use reading %s: %s", path, fault)});
      continue;
    }
    loaded.readings.push_back(std::move(*reading));
  }
  return loaded;
}

std::vector<NamedFigure> figuresOf(const std::vector<Reading>& readings) {
  std::vector<NamedFigure> named;
  for (const Reading& reading : readings) {
    const auto add = [&](const Figure& figure, std::string_view suffix) {
      named.push_back({format("%s.%s%s", reading.name, figure.kind->name, suffix),
                       figure.kind->unit, figure.value, figure.kind->source, figure.kind->meaning});
    };
    for (const Figure& figure : reading.figures)
      add(figure, "");
    for (const Figure& figure : reading.growth)
      add(figure, "_growth");
  }
  return named;
}

}  // namespace tavrel::health
