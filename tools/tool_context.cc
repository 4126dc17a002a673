#include "tools/tool_context.h"

#include <ostream>

#include "platform/linux/device_root.h"
#include "platform/linux/linux_platform.h"
#include "tools/table.h"

namespace tavrel {

ToolContext::ToolContext(const ToolStreams& streams) : streams_(streams) {}
ToolContext::~ToolContext() = default;

const DeviceRoot& ToolContext::root() {
  if (!root_) {
    root_ = std::make_unique<DeviceRoot>(rootFolder_ ? DeviceRoot(*rootFolder_)
                                                     : DeviceRoot::fromEnvironment());
  }
  return *root_;
}

LinuxPlatform& ToolContext::linuxPlatform() {
  if (!linuxPlatform_) linuxPlatform_ = std::make_unique<LinuxPlatform>(root());
  return *linuxPlatform_;
}

Platform& ToolContext::platform() {
  return linuxPlatform().platform();
}

void ToolContext::addJsonOption(CLI::App& command) {
  command.add_flag("--json", json_, "Print JSON (format_version 1)");
}

void ToolContext::printJson(Json object) {
  Json document = {{"format_version", kJsonFormatVersion}};
  auto& members = document.get_ref<Json::object_t&>();
  for (auto& [name, value] : object.get_ref<Json::object_t&>()) {
    members.emplace_back(name, std::move(value));
  }
  streams_.out << document.dump(2, ' ', false, Json::error_handler_t::replace) << '\n';
}

void ToolContext::printLine(std::string_view message) {
  streams_.out.flush();
  streams_.error << "tavrelctl: " << printable(message) << '\n';
}

void ToolContext::fail(std::string_view message) {
  printLine(message);
  exitStatus_ = kExitFailure;
}

void ToolContext::failUsage(std::string_view message) {
  printLine(message);
  exitStatus_ = kExitUsage;
}

void ToolContext::note(std::string_view message) {
  printLine(message);
}

}  // namespace tavrel
