#include "platform/linux/health/growth.h"

#include <limits>

#include "base/limits.h"
#include "platform/plist/coding.h"
#include "platform/plist/xml.h"

namespace tavrel::health {
namespace {

using Counters = std::map<std::string, std::int64_t, std::less<>>;

constexpr std::int64_t kMemoryVersion = 1;

// The growth of a counter since `last`; nothing when that cannot be known.
std::optional<std::int64_t> step(const Figure& figure, std::int64_t last, bool isSameBoot) {
  if (figure.kind->resets == Resets::OnAttach && (!isSameBoot || figure.value < last)) {
    return figure.value;
  }
  if (figure.value < last) return std::nullopt;
  return figure.value - last;
}

plist::Dictionary encode(const Counters& counters) {
  auto dictionary = plist::Dictionary::create(counters.size());
  for (const auto& [name, value] : counters)
    dictionary.set(name, value);
  return dictionary;
}

Counters decodeCounters(const plist::Dictionary& dictionary) {
  Counters counters;
  for (const plist::Entry& entry : dictionary) {
    const auto number = entry.value.number();
    if (number && number->int64() >= 0) {
      counters.emplace(std::string(entry.key.view()), number->int64());
    }
  }
  return counters;
}

}  // namespace

Figures takeGrowth(DriveMemory& memory, const Figures& figures, const Moment& moment) {
  const bool runPassed = moment.runDay && memory.runDay != moment.runDay;
  if (runPassed) {
    memory.grown.clear();
    memory.lost.clear();
    memory.isCounting = !memory.last.empty();
  }
  const bool isSameBoot = memory.boot == moment.boot;
  Figures growth;
  for (const Figure& figure : figures) {
    if (figure.kind->resets == Resets::NotACounter) continue;
    // Whether it began at 0 since the last reading is not known. The next one sees all it counted.
    if (figure.kind->resets == Resets::OnAttach && moment.boot.empty()) continue;
    const std::string name(figure.kind->name);
    const auto last = memory.last.find(name);
    const auto grownBy =
        last == memory.last.end() ? std::nullopt : step(figure, last->second, isSameBoot);
    memory.last[name] = figure.value;
    if (!memory.isCounting) continue;
    if (!grownBy) memory.lost.insert(name);
    std::int64_t& grown = memory.grown[name];
    if (__builtin_add_overflow(grown, grownBy.value_or(0), &grown)) {
      grown = std::numeric_limits<std::int64_t>::max();
    }
    if (!memory.lost.contains(name)) growth.push_back({figure.kind, grown});
  }
  if (!moment.boot.empty()) memory.boot = moment.boot;
  memory.seen = moment.seconds;
  if (moment.runDay) memory.runDay = moment.runDay;
  return growth;
}

bool Memory::forgetOld(std::int64_t now) {
  return std::erase_if(drives, [now](const auto& drive) {
           return drive.second.seen < now - limits::kDriveMemorySeconds;
         }) > 0;
}

Expected<std::string> encodeMemory(const Memory& memory) {
  auto drives = plist::Dictionary::create(memory.drives.size());
  for (const auto& [identity, drive] : memory.drives) {
    auto lost = plist::Array::create();
    for (const std::string& name : drive.lost)
      lost.append(name);
    plist::Dictionary entry = {{"boot", drive.boot},           {"seen", drive.seen},
                               {"counting", drive.isCounting}, {"last", encode(drive.last)},
                               {"grown", encode(drive.grown)}, {"lost", lost}};
    if (drive.runDay) entry.set("run_day", *drive.runDay);
    drives.set(identity, entry);
  }
  auto ocp = plist::Dictionary::create();
  for (const auto& [drive, has] : memory.hasOcpLog)
    ocp.set(drive, has);
  return plist::writeXml(
      plist::Dictionary{{"version", kMemoryVersion}, {"drives", drives}, {"ocp_log", ocp}});
}

Expected<Memory> decodeMemory(ByteSpan document) {
  const auto value = plist::read(document);
  if (!value) return value.error();
  const plist::Dictionary top = value->dictionary();
  const auto version = top.number("version");
  if (!version || version->int64() != kMemoryVersion) return Error{"of another version"};
  Memory memory;
  for (const plist::Entry& entry : top.dictionary("drives")) {
    const plist::Dictionary from = entry.value.dictionary();
    if (!from) continue;
    DriveMemory& drive = memory.drives[std::string(entry.key.view())];
    drive.boot = from.string("boot").value_or("");
    drive.seen = from.number("seen").value_or(0).int64();
    drive.isCounting = from.boolean("counting").value_or(false);
    if (const auto day = from.number("run_day")) drive.runDay = day->int64();
    drive.last = decodeCounters(from.dictionary("last"));
    drive.grown = decodeCounters(from.dictionary("grown"));
    for (const plist::Value& name : from.array("lost")) {
      if (const auto text = name.string()) drive.lost.emplace(*text);
    }
  }
  for (const plist::Entry& entry : top.dictionary("ocp_log")) {
    if (const auto has = entry.value.boolean()) {
      memory.hasOcpLog[std::string(entry.key.view())] = *has;
    }
  }
  return memory;
}

}  // namespace tavrel::health
