// The log of a day, made by the daemon's own code but without changing anything.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/overlay/captured_log.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

struct LogPreview {
  std::optional<CapturedLog> log;   // whether permitted or not; nothing when none would be made
  std::string reason;               // why there is none
  bool lacksWhitelist = false;      // whether that is the reason
  std::vector<std::string> errors;  // logged while it was made; the log may then be incomplete
  std::vector<std::string> missingValues;  // which waiting ones the log lacks, for people
  std::string osVersion;
};

/// `onLine`, when given, receives each line meant for the system log.
LogPreview previewLog(
    ToolContext& context, std::int32_t day,
    const std::function<void(std::string_view level, std::string_view message)>& onLine = {});

}  // namespace tavrel
