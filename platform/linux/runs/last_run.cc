#include "platform/linux/runs/last_run.h"

#include <algorithm>
#include <unistd.h>

#include "base/limits.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/files/process_stat.h"
#include "platform/plist/coding.h"

namespace tavrel {
namespace {

constexpr std::string_view kKindNames[] = {"daily", "forced", "today", "service"};

std::optional<RunKind> kindNamed(std::optional<std::string_view> name) {
  for (std::size_t i = 0; i < std::size(kKindNames); ++i)
    if (name == kKindNames[i]) return static_cast<RunKind>(i);
  return std::nullopt;
}

// The content of a kernel file without its line end; empty when it cannot be read.
std::string kernelText(const std::string& path) {
  auto text = FileSystem().read(path, limits::kSystemFactBytes);
  if (!text) return {};
  while (text->ends_with('\n'))
    text->pop_back();
  return std::move(*text);
}

// Processes are the machine's, whatever the root.
std::string bootOfMachine() {
  return bootIDOf(DeviceRoot("/"));
}

// The process's start in clock ticks since boot; 0 when there is no such process.
std::int64_t startOf(std::int64_t process) {
  const std::string stat = kernelText("/proc/" + std::to_string(process) + "/stat");
  return static_cast<std::int64_t>(startInStat(stat).value_or(0));
}

std::optional<std::int64_t> integerIn(const plist::Dictionary& entries, std::string_view key) {
  const auto number = entries.number(key);
  return number ? std::optional(number->int64()) : std::nullopt;
}

}  // namespace

ProcessIdentity ProcessIdentity::ofThis() {
  const std::int64_t process = ::getpid();
  return {process, startOf(process), bootOfMachine()};
}

bool ProcessIdentity::isRunning() const {
  return started != 0 && boot == bootOfMachine() && startOf(process) == started;
}

void LastRun::addError(std::string_view message) {
  ++errorCount;
  if (errors.size() >= kErrors) return;
  std::size_t size = std::min(message.size(), kErrorBytes);
  // Do not cut within a character.
  while (size > 0 && size < message.size() && (message[size] & 0xC0) == 0x80)
    --size;
  errors.emplace_back(message.substr(0, size));
  if (size < message.size()) errors.back() += "…";
}

Expected<std::optional<LastRun>> LastRun::read(const DeviceRoot& root, FileSystem& files) {
  const std::string path = root.path(kLastRunFile);
  const auto bytes = files.readIfPresent(path, limits::kSystemFactBytes);
  if (!bytes) return bytes.error();
  if (!*bytes) return std::optional<LastRun>();
  const auto document = plist::read(asBytes(**bytes));
  const plist::Dictionary entries = document ? document->dictionary() : plist::Dictionary();
  const auto began = entries.date("Time");
  if (!began) return Error{"cannot use " + path + ": it is not the record of a run: remove it"};
  LastRun run;
  run.began = *began;
  run.kind = kindNamed(entries.string("Task"));
  run.day = integerIn(entries, "Day");
  run.isFinished = entries.boolean("Finished").value_or(false);
  run.ended = entries.date("Ended");
  run.lastFinished = entries.date("LastFinished");
  run.errorCount = integerIn(entries, "ErrorCount").value_or(0);
  const plist::Array errors = entries.array("Errors");
  for (std::size_t i = 0; i < std::min(errors.size(), kErrors); ++i)
    run.errors.emplace_back(errors.at(i).string().value_or(""));
  run.process = {integerIn(entries, "Process").value_or(0),
                 integerIn(entries, "Started").value_or(0),
                 std::string(entries.string("Boot").value_or(""))};
  return std::optional(std::move(run));
}

Status LastRun::write(const DeviceRoot& root, FileSystem& files) const {
  plist::Dictionary entries{{"Time", began},
                            {"Finished", isFinished},
                            {"ErrorCount", errorCount},
                            {"Process", process.process},
                            {"Started", process.started},
                            {"Boot", process.boot}};
  if (kind) entries.set("Task", kKindNames[static_cast<std::size_t>(*kind)]);
  if (day) entries.set("Day", *day);
  if (ended) entries.set("Ended", *ended);
  if (lastFinished) entries.set("LastFinished", *lastFinished);
  plist::Array texts = plist::Array::create(errors.size());
  for (const std::string& error : errors)
    texts.append(error);
  entries.set("Errors", texts);
  const auto document = plist::PlistCoding().encodeXml(entries);
  if (!document) return document.error();
  return files.replace(root.path(kLastRunFile), asBytes(*document), 0644);
}

}  // namespace tavrel
