// The device's platform as commands use it that ask its drivers: what the services and the system's
// own operations have to say becomes notes of the tool.
//
//   NotingPlatform noting(context);
//   const plist::Dictionary info = CopyNANDInfo(noting.platform());
//
// The context must outlive it.
#pragma once

#include <memory>

#include "platform/platform.h"
#include "tools/tool_context.h"

namespace tavrel {

class RecordedRegistry;

/// Both standard streams as notes, so that no output of the tool is mixed with them. Each text is a
/// message of its own, with or without a line end.
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
  ~NotingPlatform();
  NotingPlatform(const NotingPlatform&) = delete;
  NotingPlatform& operator=(const NotingPlatform&) = delete;

  Platform& platform();
  /// The platform's registry of drivers.
  RecordedRegistry& registry();
  /// Whether the system has said that something is wrong.
  bool hasErrors() const;
  /// Whether the system's own operations have printed anything.
  bool hasPrinted() const;

 private:
  struct Services;
  std::unique_ptr<Services> services_;
};

}  // namespace tavrel
