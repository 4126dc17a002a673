#include "tools/device/prefs_commands.h"

#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/submission_permission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/persisted_state.h"
#include "platform/plist/encodable_text.h"
#include "platform/plist/xml.h"
#include "tools/console/json_value.h"
#include "tools/console/sorted_entries.h"
#include "tools/console/table.h"
#include "tools/console/typed_value.h"
#include "tools/console/value_text.h"
#include "tools/device/known_preferences.h"
#include "tools/shared/input_file.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string domain;
  std::string key;
  std::string value;
  ArgumentKind kind = ArgumentKind::Text;
  bool kindGiven = false;
  bool isDocument = false;
  bool force = false;
};

bool checkDomain(ToolContext& context, const std::string& domain) {
  if (FilePreferences::isValidDomain(domain)) return true;
  context.failUsage(
      format("not a preference domain: %s: give a name such as com.example.app, "
             "without slashes",
             domain));
  return false;
}

void failAbsent(ToolContext& context, const Arguments& arguments) {
  // An unreadable domain has already been reported.
  if (context.hasComplaints()) return context.setExitStatus(kExitFailure);
  context.fail(
      format("no preference %s in domain %s: 'tavrelctl prefs list %s' shows what there is",
             arguments.key, arguments.domain, arguments.domain));
}

// A note on a change of the permission through 'tavrelctl prefs'; empty for other changes.
std::string permissionNote(const Arguments& arguments, const SubmissionPermission& former,
                           const SubmissionPermission& now) {
  if (arguments.domain != kDiagnosticsDomain) return {};
  if (arguments.key == kSubmissionEnabledKey && (!now.isGiven || !former.isGiven)) {
    return now.isGiven
               ? "this takes effect at once, even for what is already recorded: 'tavrelctl allow' "
                 "begins with the next day"
               : "logs that wait stay until the next run: 'tavrelctl deny' deletes them";
  }
  const bool isEarlier =
      former.isGiven && former.firstDay && now.covers(std::int64_t{*former.firstDay} - 1);
  if (arguments.key == kSubmissionFirstDayKey && isEarlier) {
    return "what was recorded earlier may leave now too: 'tavrelctl deny', then 'tavrelctl "
           "allow', "
           "begins with the next day";
  }
  return {};
}

// Stores a value, or removes the key when the value is null. After a failure, a note has said why.
bool store(ToolContext& context, const Arguments& arguments, const plist::Value& value) {
  Preferences& preferences = context.preferences();
  const SubmissionPermission former = submissionPermission(preferences);
  preferences.ZTXPreferencesSetValue(arguments.key, value, arguments.domain);
  // A first day belongs to the permission that 'tavrelctl allow' gave, so it is removed together
  // with that. The switch alone then takes effect at once.
  if (arguments.domain == kDiagnosticsDomain && arguments.key == kSubmissionEnabledKey &&
      !(former.isGiven && value.boolean().value_or(false))) {
    preferences.ZTXPreferencesSetValue(kSubmissionFirstDayKey, {}, kDiagnosticsDomain);
  }
  if (!preferences.ZTXPreferencesSynchronize(arguments.domain) ||
      preferences.ZTXPreferencesGetValue(arguments.key, arguments.domain) != value) {
    context.setExitStatus(kExitFailure);
    return false;
  }
  const std::string note = permissionNote(arguments, former, submissionPermission(preferences));
  if (!note.empty()) context.note(note);
  return true;
}

void get(ToolContext& context, const Arguments& arguments) {
  if (!checkDomain(context, arguments.domain)) return;
  const auto value = context.preferences().ZTXPreferencesGetValue(arguments.key, arguments.domain);
  if (!value) return failAbsent(context, arguments);
  if (context.json()) {
    return context.printJson({{"domain", arguments.domain},
                              {"key", arguments.key},
                              {"type", kindName(value)},
                              {"value", jsonOf(value)}});
  }
  if (const auto text = value.string()) {
    context.out() << *text << '\n';
  } else {
    printOutline(context.out(), value);
  }
}

Expected<plist::Value> valueOf(ToolContext& context, const Arguments& arguments) {
  if (!arguments.isDocument) return parseArgument(arguments.value, arguments.kind);
  if (arguments.value == "-") return readDocument(context, "-");
  if (arguments.value == "@") return Error{"no file after @: write @FILE"};
  if (arguments.value.starts_with('@')) return readDocument(context, arguments.value.substr(1));
  return decodeDocument(arguments.value, "VALUE");
}

// The text "true" stored as the permission permits nothing, so say so.
void noteTextThatReadsOtherwise(ToolContext& context, const Arguments& arguments) {
  if (arguments.kindGiven) return;
  const std::string& text = arguments.value;
  if (text == "true" || text == "false") {
    context.note(format("stored as a string: %s: use --bool for a boolean", text));
  } else if (parseArgument(text, ArgumentKind::Real)) {
    context.note(format("stored as a string: %s: use --int or --float for a number", text));
  }
}

void set(ToolContext& context, const Arguments& arguments) {
  if (!checkDomain(context, arguments.domain)) return;
  const auto value = valueOf(context, arguments);
  if (!value) return context.failUsage(value.error().message);
  if (!plist::isEncodable(arguments.key, plist::Alphabet::Xml) || !hasXmlTextsOnly(*value)) {
    return context.failUsage(
        "cannot be stored: property lists allow only UTF-8 without control characters: give such "
        "bytes as --plist '{\"$data\": \"BASE64\"}'");
  }
  const auto xml = plist::writeXml(*value);
  if (!xml) return context.failUsage(format("cannot be stored: %s", xml.error().message));
  const auto fault = faultOfPreference(arguments.domain, arguments.key, *value);
  if (fault && !arguments.force) {
    return context.failUsage(
        format("%s: %s, or store it anyway with --force", fault->what, fault->cure));
  }
  // Stores the value as it will be read back: dates, for example, lose their fraction.
  if (store(context, arguments, *plist::readXml(asBytes(*xml)))) {
    noteTextThatReadsOtherwise(context, arguments);
  }
}

void remove(ToolContext& context, const Arguments& arguments) {
  if (!checkDomain(context, arguments.domain)) return;
  FilePreferences& preferences = context.preferences();
  if (!preferences.ZTXPreferencesGetValue(arguments.key, arguments.domain)) {
    return failAbsent(context, arguments);
  }
  store(context, arguments, {});
}

void listDomains(ToolContext& context) {
  const auto domains = context.preferences().domains();
  if (!domains) return context.fail(domains.error().message);
  if (context.json()) return context.printJson({{"domains", *domains}});
  if (domains->empty()) context.out() << "no preferences\n";
  for (const std::string& domain : *domains)
    context.out() << printable(domain) << '\n';
}

void list(ToolContext& context, const Arguments& arguments) {
  if (arguments.domain.empty()) return listDomains(context);
  if (!checkDomain(context, arguments.domain)) return;
  const auto values = context.preferences().values(arguments.domain);
  if (context.hasComplaints()) context.setExitStatus(kExitFailure);
  if (context.json()) {
    return context.printJson({{"domain", arguments.domain}, {"values", jsonOf(values)}});
  }
  Table table({{"KEY"}, {"TYPE"}, {"VALUE"}});
  for (const plist::Entry* entry : sortedEntries(values)) {
    table.add({std::string(entry->key.view()), std::string(kindName(entry->value)),
               inlineText(entry->value)});
  }
  if (!table.empty()) {
    table.print(context.page());
  } else if (!context.hasComplaints()) {
    context.out() << format("no preferences in domain %s\n", arguments.domain);
  }
}

void addKindOptions(Command command, const std::shared_ptr<Arguments>& arguments) {
  const Command kinds = command.addChoice("Kind of VALUE");
  const auto add = [&](const char* name, ArgumentKind kind, const char* description) {
    kinds.addFlag(
        name,
        [arguments, kind] {
          arguments->kind = kind;
          arguments->kindGiven = true;
        },
        description);
  };
  add("--string", ArgumentKind::Text, "A text (the default)");
  add("--bool", ArgumentKind::Boolean, "true, yes, on or 1, or false, no, off or 0");
  add("--int", ArgumentKind::Integer, "A decimal integer of at most 64 bits");
  add("--float", ArgumentKind::Real, "A real number");
  add("--date", ArgumentKind::Date, "YYYY-MM-DDTHH:MM:SSZ or YYYY-MM-DD, UTC");
  kinds.addFlag(
      "--plist",
      [arguments] {
        arguments->isDocument = true;
        arguments->kindGiven = true;
      },
      "A property list or JSON: the document itself, @FILE, or - for standard input");
}

}  // namespace

void addPrefsCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("prefs", "Read and write preferences");
  const auto arguments = std::make_shared<Arguments>();
  const auto add = [&](const char* name, const char* description,
                       void (*action)(ToolContext&, const Arguments&)) {
    const Command command = group.addCommand(name, description);
    command.onRun([&context, arguments, action] { action(context, *arguments); });
    return command;
  };
  const auto addDomain = [&](Command command) {
    return command.addOption("DOMAIN", arguments->domain, "Preference domain").notEmpty();
  };
  const auto addKey = [&](Command command) {
    return command.addOption("KEY", arguments->key, "Preference key").required();
  };

  const Command getCommand = add("get", "Print the value of a key", get);
  addDomain(getCommand).required();
  addKey(getCommand).notEmpty();
  context.addJsonOption(getCommand);

  const Command setCommand = add("set", "Set a key", set);
  addDomain(setCommand).required();
  addKey(setCommand).notEmpty();
  setCommand.addOption("VALUE", arguments->value, "The value").required();
  addKindOptions(setCommand, arguments);
  setCommand.addFlag("--force", arguments->force,
                     "Store the value even if the system would not read it as that preference");

  const Command deleteCommand = add("delete", "Remove a key", remove);
  addDomain(deleteCommand).required();
  addKey(deleteCommand);

  const Command listCommand = add("list", "List the keys of a domain, or the domains", list);
  addDomain(listCommand);
  context.addJsonOption(listCommand);
}

}  // namespace tavrel
