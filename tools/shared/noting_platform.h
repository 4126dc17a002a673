// The device's platform for commands that use its drivers: whatever the system's own operations
// print appears as notes of the tool.
//
//   NotingPlatform noting(context);
//   const plist::Dictionary info = CopyNANDInfo(noting.platform());
//
// The context must outlive it.
#pragma once

#include <string_view>

#include "platform/platform.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// Turns both standard streams into notes, so that they do not mix with the tool's output. Each
/// text is a separate message, with or without a line end.
class NotingStreams final : public StandardStreams {
 public:
  explicit NotingStreams(ToolContext& context) : context_(context) {}

  void writeOutput(std::string_view text) override;
  bool hasPrinted() const { return hasPrinted_; }
  void writeError(std::string_view text) override { writeOutput(text); }

 private:
  ToolContext& context_;
  bool hasPrinted_ = false;
};

class NotingPlatform {
 public:
  explicit NotingPlatform(ToolContext& context);
  NotingPlatform(const NotingPlatform&) = delete;
  NotingPlatform& operator=(const NotingPlatform&) = delete;

  Platform& platform() { return platform_; }
  /// Whether the system has reported an error.
  bool hasErrors() const { return context_.hasComplaints(); }
  /// Whether the system's own operations have printed anything.
  bool hasPrinted() const { return streams_.hasPrinted(); }

 private:
  ToolContext& context_;
  NotingStreams streams_;
  Platform platform_;
};

}  // namespace tavrel
