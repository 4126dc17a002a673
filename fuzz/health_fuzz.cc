// Log pages, registers, texts from sysfs, readings and remembered counters. What was read and
// written again must read back, and only counters may exceed what was remembered.
//
// Input: a byte that chooses the reader, then its bytes.
#include "platform/linux/health/flash_life.h"
#include "platform/linux/health/growth.h"
#include "platform/linux/health/nvme_logs.h"
#include "platform/linux/health/reading.h"
#include "platform/linux/health/verdict.h"
#include "plist_mutator.h"
#include "require.h"

using namespace tavrel;
using namespace tavrel::health;
using fuzz::require;

namespace {

constexpr unsigned kReading = 4;

void judgeAll(Figures figures) {
  Reading reading;
  reading.figures = std::move(figures);
  judge(reading, 0, "");
  figuresOf({reading});
}

void readReading(ByteSpan bytes) {
  const auto reading = decodeReading(bytes);
  if (!reading) return require(!reading.error().message.empty());
  judge(*reading, 0, "");
  figuresOf({*reading});
  const auto document = encodeReading(*reading);
  if (!document) return;  // its time is beyond the calendar
  const auto again = decodeReading(asBytes(*document));
  require(again && again->figures.size() == reading->figures.size());
  const auto second = encodeReading(*again);
  require(second && *second == *document);
}

void readMemory(ByteSpan bytes) {
  auto memory = decodeMemory(bytes);
  if (!memory) return require(!memory.error().message.empty());
  if (const auto document = encodeMemory(*memory)) {
    const auto again = decodeMemory(asBytes(*document));
    require(again && again->drives.size() == memory->drives.size());
    const auto second = encodeMemory(*again);
    require(second && *second == *document);
  }
  Figures figures;
  for (const FigureKind& kind : nvmeSmartKinds())
    figures.push_back({&kind, 1'000});
  for (auto& [identity, drive] : memory->drives) {
    for (const std::int64_t day : {20'000, 20'001}) {
      for (const Figure& grown : takeGrowth(drive, figures, {day * 86'400, "boot", day}))
        require(grown.kind->resets != Resets::NotACounter && drive.last.contains(grown.kind->name));
    }
  }
  memory->forgetOld(20'001 * std::int64_t{86'400});
}

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t most, unsigned seed) {
  if (size < 2 || data[0] % 6 < kReading) return LLVMFuzzerMutate(data, size, most);
  return 1 + fuzz::mutatePropertyList(data + 1, size - 1, most - 1, seed);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  const ByteSpan bytes = std::as_bytes(std::span(data + 1, size - 1));
  const std::string_view text = asText(bytes);
  switch (data[0] % 6) {
    case 0:
      if (auto figures = nvmeSmartFigures(bytes)) judgeAll(std::move(*figures));
      break;
    case 1:
      if (auto figures = nvmeOcpFigures(bytes)) {
        appendNvmeDerived(*figures);
        judgeAll(std::move(*figures));
      }
      break;
    case 2:
      if (auto figures = emmcFigures(bytes)) judgeAll(std::move(*figures));
      break;
    case 3:
      judgeAll(emmcFigures(text, text));
      judgeAll(ufsFigures(text, text, text));
      break;
    case kReading:
      readReading(bytes);
      break;
    default:
      readMemory(bytes);
  }
  return 0;
}
