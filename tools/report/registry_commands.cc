#include "tools/report/registry_commands.h"

#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>
#include <vector>

#include "base/format.h"
#include "base/parse_number.h"
#include "ioreport/keys.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/linux/recorded/recording.h"
#include "platform/linux/recorded/recording_folder.h"
#include "platform/linux/recorded/typed_fields.h"
#include "platform/plist/xml.h"
#include "platform/report_protocol.h"
#include "tools/console/json_value.h"
#include "tools/console/output_file.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"
#include "tools/report/live_recording.h"
#include "tools/report/report_selection.h"
#include "tools/shared/subcommand.h"

namespace tavrel {
namespace {

constexpr std::uint32_t kMostSeconds = 3600;

struct Arguments {
  std::string id;
  std::string file;
  bool live = false;
  std::uint32_t seconds = 0;
};

// The readable recordings. If some are missing, notes have said why, and the exit status is 1.
struct CurrentRecording {
  plist::Dictionary content;
  bool isWhole;
};

CurrentRecording currentRecording(ToolContext& context) {
  const plist::Dictionary content = context.linuxPlatform().registry().recording();
  if (context.hasComplaints()) context.setExitStatus(kExitFailure);
  return {content, !context.hasComplaints()};
}

// Adds the live services, and the hub that exists for them.
plist::Dictionary allServices(ToolContext& context) {
  const plist::Dictionary recorded = currentRecording(context).content;
  const plist::Array live = context.linuxPlatform().registry().liveServices();
  if (live.empty()) return recorded;
  plist::Dictionary all = plist::mutableCopy(recorded);
  plist::Array services = plist::mutableCopy(recorded.array("Services"));
  for (const plist::Value& service : live)
    services.append(service);
  all.set("Services", services);
  if (!all.dictionary("Hub")) all.set("Hub", plist::Dictionary{{"EntryID", kLiveHubID}});
  return all;
}

// The services of a recording, with the hub last.
std::vector<plist::Dictionary> servicesOf(const plist::Dictionary& recording) {
  std::vector<plist::Dictionary> services;
  for (const plist::Value& service : recording.array("Services")) {
    if (service.dictionary().string("Class")) services.push_back(service.dictionary());
  }
  if (const plist::Dictionary hub = recording.dictionary("Hub")) {
    plist::Dictionary service = plist::mutableCopy(hub);
    service.set("Class", kReportHubClass);
    services.push_back(service);
  }
  return services;
}

std::size_t channelCount(const plist::Dictionary& service) {
  std::size_t count = 0;
  for (const plist::Value& group : service.dictionary("Properties").array(kLegendKey))
    count += group.dictionary().array(kChannelsKey).size();
  return count;
}

void list(ToolContext& context, const Arguments&) {
  Table table({{"ID", Table::Align::Right},
               {"CLASS"},
               {"NAME"},
               {"PUBLIC"},
               {"CHANNELS", Table::Align::Right},
               {"METHODS", Table::Align::Right}});
  Json services = Json::array();
  for (const plist::Dictionary& service : servicesOf(allServices(context))) {
    const auto id = wordOf(service.get("EntryID"));
    const std::string_view className = *service.string("Class");
    const std::string_view name = service.string("Name").value_or(className);
    const bool isPublic =
        service.dictionary("Properties").boolean(kLegendPublicKey).value_or(false);
    const std::size_t methods = service.array("Methods").size();
    if (context.json()) {
      services.push_back({{"id", id ? Json(*id) : Json()},
                          {"class", className},
                          {"name", name},
                          {"public", isPublic},
                          {"channels", channelCount(service)},
                          {"methods", methods}});
    } else {
      table.add({id ? format("%#llx", *id) : "-", std::string(className), std::string(name),
                 isPublic ? "yes" : "no", std::to_string(channelCount(service)),
                 std::to_string(methods)});
    }
  }
  if (context.json()) return context.printJson({{"services", std::move(services)}});
  if (table.empty()) {
    // Unreadable recordings have already been reported.
    if (context.hasComplaints()) return;
    context.out() << "no drivers: recordings of them belong in "
                  << printable(context.root().path(kRecordingFolder)) << '\n';
    return;
  }
  table.print(context.page());
}

void show(ToolContext& context, const Arguments& arguments) {
  const auto id = parseWord(arguments.id);
  if (!id) {
    return context.failUsage(
        format("not an entry id: %s: give a 64-bit number, decimal or with 0x", arguments.id));
  }
  for (const plist::Dictionary& service : servicesOf(allServices(context))) {
    if (wordOf(service.get("EntryID")) != *id) continue;
    if (context.json()) return context.printJson({{"service", jsonOf(service)}});
    return printOutline(context.out(), service);
  }
  context.fail(
      format("no service has entry id %#llx: 'tavrelctl registry list' shows what there is", *id));
}

void record(ToolContext& context, const Arguments& arguments) {
  if (arguments.seconds > 0 && !arguments.live) {
    return context.failUsage("--seconds is for --live: recordings are written as they are");
  }
  if (const Status usable = checkOutput(arguments.file); !usable) {
    return context.fail(usable.error().message);
  }
  const CurrentRecording current =
      arguments.live ? CurrentRecording{recordLive(context, arguments.seconds), true}
                     : currentRecording(context);
  if (!current.isWhole) {
    return context.fail(format("nothing is written to %s: repair or remove what could not be read",
                               arguments.file));
  }
  const plist::Dictionary& recording = current.content;
  if (!recording) return;
  const auto document = plist::writeXml(recording);
  if (!document) {
    return context.fail(
        format("cannot write %s: %s", arguments.file, std::string_view(document.error().message)));
  }
  if (const Status written = writeOutput(context, arguments.file, *document); !written) {
    context.fail(written.error().message);
  }
}

std::string secondsFault(const std::string& text) {
  const auto seconds = parseNumber<std::uint32_t>(text);
  if (seconds && *seconds <= kMostSeconds) return {};
  return format("not a number of seconds: %s: give 0 to %u", text, kMostSeconds);
}

}  // namespace

void addRegistryCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("registry", "Show and record drivers");
  const auto arguments = std::make_shared<Arguments>();

  context.addJsonOption(addCommand(group, "list", "List the services", arguments, context, list));

  const Command shown =
      addCommand(group, "show", "Show everything about one service", arguments, context, show);
  shown.addOption("ID", arguments->id, "Its entry id, decimal or with 0x").required();
  context.addJsonOption(shown);

  const Command recorded =
      addCommand(group, "record", "Write all recordings, or the live services, as one recording",
                 arguments, context, record);
  recorded.addFlag("--live", arguments->live,
                   "What this machine shows now, in place of the recordings");
  recorded
      .addOption(
          "--seconds", arguments->seconds,
          "With --live: continue for N seconds, a sample per second (default 0, at most 3600)")
      .typeName("N")
      .check(secondsFault);
  recorded
      .addOption("FILE", arguments->file,
                 "Property list to write, in one step; - is standard output")
      .required()
      .notEmpty();
}

}  // namespace tavrel
