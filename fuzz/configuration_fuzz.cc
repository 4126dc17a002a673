// Files of settings and of memory, and URLs. Each is either refused with a one-line message or read
// into values within their bounds, and what a program remembers reads back as it was written.
//
// Input: a byte that chooses the file; a byte that, when odd, means that the property list is built
// from what follows; the content.
#include <cmath>
#include <vector>

#include "base/limits.h"
#include "memory_tree.h"
#include "platform/linux/device/ecc_events.h"
#include "platform/linux/device/file_device_answers.h"
#include "platform/linux/device/linux_system_controls.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/folding/fold_notes.h"
#include "platform/linux/folding/recorders.h"
#include "platform/linux/limits/device_limits.h"
#include "platform/linux/runs/last_run.h"
#include "platform/plist/coding.h"
#include "reporting_values.h"
#include "support.h"
#include "upload/configuration.h"
#include "upload/pause.h"

using namespace tavrel;
using fuzz::require;

namespace {

constexpr std::string_view kKeys[] = {"Store",
                                      "Pending",
                                      "Days",
                                      "Bytes",
                                      "Refused",
                                      "com.norvane.",
                                      "0",
                                      "4294967295",
                                      "root",
                                      "URL",
                                      "ConnectSeconds",
                                      "RunSeconds",
                                      "AllowPlainHTTP",
                                      "NeedsDefaultRoute",
                                      "MeteredInterfaces",
                                      "ProductName",
                                      "ProductVersion",
                                      "ProductBuildVersion",
                                      "vm.swapusage",
                                      "errno",
                                      "DiskUsage",
                                      "Time",
                                      "Task",
                                      "Day",
                                      "Finished",
                                      "Errors",
                                      "ErrorCount",
                                      "Process",
                                      "Boot",
                                      "LastAttempt",
                                      "NextAttempt",
                                      "FailedAttempts",
                                      "Sent",
                                      "Failure"};

struct Device : fuzz::Tree {
  fuzz::SilentLog log;
  FileSystem files;
  plist::PlistCoding coding;
};

void requireLine(const Error& error) {
  require(!error.message.empty());
}

void readLimits(Device& device) {
  const auto limits = DeviceLimits::read(device.root, device.files, device.coding);
  if (!limits) return requireLine(limits.error());
  for (const KeptKind& kind : kKeptKinds)
    require(limits->of(kind.kind).days >= 1 && limits->of(kind.kind).bytes >= 64 << 10);
}

void readRecorders(Device& device) {
  const auto recorders = Recorders::read(device.root, device.files, device.coding, device.log);
  for (const std::string_view key : {"", "a", "com.norvane.usage.x", "com.example.starts"}) {
    require(recorders.mayRecord(0, key));
    for (const std::uint32_t user : {1U, 1000U, UINT32_MAX})
      recorders.mayRecord(user, key);
  }
}

void readUpload(Device& device) {
  const auto configuration =
      upload::readConfiguration(device.root, device.files, device.coding, device.root.path("/c"));
  if (!configuration) return requireLine(configuration.error());
  require(!configuration->url.ends_with('/') && !configuration->host.empty());
  require(configuration->run.count() >= 1 &&
          configuration->run.count() <= limits::kLongestUploadPauseSeconds);
}

void readSystem(Device& device) {
  LinuxSystemVersion version(device.root, device.files, device.coding, device.log);
  for (const plist::Entry& entry : version.systemVersionDictionary())
    require(entry.value.string().has_value());
  require(!version.text().empty());
  FileDeviceAnswers(device.root, device.files, device.coding, device.log).SQCopyAnswer("DiskUsage");
  EccEvents events(device.root, device.files, device.coding, device.log, EccEvents::Mode::Peek);
  LinuxSystemControls controls(device.root, device.files, device.coding, device.log, events);
  for (std::size_t size = 0; size <= 9; ++size) {
    std::vector<std::byte> buffer(size);
    const auto result = controls.read("vm.swapusage", buffer);
    require(result.length <= size && (result.errorNumber == 0 || result.length == 0));
  }
}

// The files have whole seconds.
bool isSameSecond(std::optional<plist::Date> a, std::optional<plist::Date> b) {
  if (!a || !b) return !a && !b;
  return std::floor(a->secondsSinceEpoch()) == std::floor(b->secondsSinceEpoch());
}

void readMemory(Device& device) {
  if (const auto run = LastRun::read(device.root, device.files); run && *run) {
    require((*run)->errors.size() <= LastRun::kErrors);
    if ((*run)->write(device.root, device.files)) {
      const auto again = LastRun::read(device.root, device.files);
      require(again && *again);
      const LastRun& one = **run;
      const LastRun& other = **again;
      require(other.kind == one.kind && other.errors == one.errors && other.day == one.day &&
              other.isFinished == one.isFinished && other.errorCount == one.errorCount);
      require(isSameSecond(other.began, one.began) && isSameSecond(other.ended, one.ended) &&
              isSameSecond(other.lastFinished, one.lastFinished));
      require(other.process.process == one.process.process &&
              other.process.started == one.process.started &&
              other.process.boot == one.process.boot);
    }
  }
  const std::string path = device.root.path(kUploadStateFile);
  const auto state = readUploadState(device.files, device.coding, device.log, path);
  require(state.sent >= 0 && state.refused >= 0 && state.failedAttempts >= 0);
  require(upload::pauseSeconds(state.failedAttempts, state.sent, 1.0) <=
          static_cast<double>(limits::kLongestUploadPauseSeconds));
  if (!writeUploadState(device.files, device.coding, path, state)) return;
  const auto again = readUploadState(device.files, device.coding, device.log, path);
  require(again.sent == state.sent && again.failure == state.failure &&
          again.refused == state.refused && again.failedAttempts == state.failedAttempts &&
          again.failedTransfers == state.failedTransfers);
  require(isSameSecond(again.lastAttempt, state.lastAttempt) &&
          isSameSecond(again.lastSuccess, state.lastSuccess) &&
          isSameSecond(again.lastFailure, state.lastFailure) &&
          isSameSecond(again.nextAttempt, state.nextAttempt));
}

void readNotes(Device& device, std::string_view content) {
  device.write("/run/tavrel/fold.lock", content);
  bool isNew = false;
  {
    auto notes = FoldNotes::lock(device.root, device.files, device.log);
    require(static_cast<bool>(notes));
    isNew = notes->logOnce("a line");
    require(!isNew || !notes->logOnce("a line"));
    notes->save();
  }
  auto notes = FoldNotes::lock(device.root, device.files, device.log);
  require(notes && (!isNew || !notes->logOnce("a line")));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  const unsigned choice = input.byte();
  const bool isMade = input.byte() % 2 != 0;
  std::string content(input.text());
  if (isMade) {
    fuzz::ValueReader values(input.bytes(), kKeys);
    const auto document = plist::PlistCoding().encodeXml(values.dictionary(0));
    if (!document) return 0;
    content = *document;
  }
  Device device;
  switch (choice % 6) {
    case 0:
      device.write(kLimitsPath, content);
      readLimits(device);
      break;
    case 1:
      device.write("/etc/tavrel/recorders.plist", content);
      readRecorders(device);
      break;
    case 2:
      if (choice / 6 % 2 != 0) device.write("/c/tavrel-upload.token", content.substr(0, 40));
      device.write(upload::kConfigurationPath, content);
      readUpload(device);
      break;
    case 3:
      for (const std::string name : {"system-version", "device-answers", "system-controls"})
        device.write("/etc/tavrel/" + name + ".plist", content);
      readSystem(device);
      break;
    case 4:
      device.write(kLastRunFile, content);
      device.write(kUploadStateFile, content);
      readMemory(device);
      break;
    default:
      readNotes(device, content);
  }
  return 0;
}
