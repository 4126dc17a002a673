// Log pages, registers, texts of sysfs, readings and remembered counters. The first byte chooses.
#include <cstdint>
#include <string_view>

#include "platform/linux/health/flash_life.h"
#include "platform/linux/health/growth.h"
#include "platform/linux/health/nvme_logs.h"
#include "platform/linux/health/reading.h"
#include "platform/linux/health/verdict.h"

namespace {

void judgeAll(tavrel::health::Figures figures) {
  tavrel::health::Reading reading;
  reading.figures = std::move(figures);
  tavrel::health::judge(reading, 0, "");
  tavrel::health::figuresOf({reading});
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace tavrel::health;
  if (size == 0) return 0;
  const tavrel::ByteSpan bytes = std::as_bytes(std::span(data + 1, size - 1));
  const std::string_view text = tavrel::asText(bytes);
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
    case 4:
      if (const auto reading = decodeReading(bytes)) {
        if (const auto document = encodeReading(*reading)) {
          if (!decodeReading(tavrel::asBytes(*document))) __builtin_trap();
        }
      }
      break;
    default:
      if (const auto memory = decodeMemory(bytes)) {
        if (const auto document = encodeMemory(*memory)) {
          if (!decodeMemory(tavrel::asBytes(*document))) __builtin_trap();
        }
      }
  }
  return 0;
}
