#include "tools/rehearsal/rehearse_command.h"

#include <algorithm>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <vector>

#include "base/format.h"
#include "base/quantity_text.h"
#include "platform/linux/linux_platform.h"
#include "tools/console/day_argument.h"
#include "tools/console/json_value.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"
#include "tools/rehearsal/rehearsal.h"

namespace tavrel {
namespace {

using Kind = OverlayEvent::Kind;

/// How many consecutive events of one kind are shown.
constexpr std::size_t kShownInARow = 8;

enum class Shows : std::uint8_t { Nothing, Text, Value, Bytes, Rows };

struct Phrase {
  const char* name;  // in JSON
  const char* text;
  Shows shows;
  const char* counted = nullptr;  // for changes, in the summary
};

// One row per kind, in the same order as the kinds.
constexpr Phrase kPhrases[] = {
    {"read_preference", "reads preference", Shows::Value},
    {"read_file", "reads file", Shows::Bytes},
    {"ask_device", "asks the device", Shows::Value},
    {"read_control", "reads control", Shows::Text},
    {"read_fact", "reads", Shows::Value},
    {"load_library", "links", Shows::Value},
    {"read_statistics", "reads", Shows::Rows},
    {"find_driver", "looks for driver", Shows::Text},
    {"find_drivers", "looks for drivers", Shows::Text},
    {"read_driver_property", "reads property", Shows::Text},
    {"call_driver", "calls driver", Shows::Text},
    {"set_preference", "would set preference", Shows::Value, "preference"},
    {"remove_preference", "would remove preference", Shows::Nothing, "preference removal"},
    {"write_preferences", "would write preferences of", Shows::Nothing},
    {"set_scalar", "would set scalar", Shows::Value, "scalar"},
    {"checkpoint", "would checkpoint", Shows::Nothing},
    {"file_record", "would file record of", Shows::Value, "structured record"},
    {"submit_log", "would submit", Shows::Text, "log"},
    {"send_on", "would send on", Shows::Nothing, "dispatch of the pending logs"},
    {"post_notification", "would post notification", Shows::Nothing, "notification"},
    {"clean_up", "would remove", Shows::Value},
    {"roll_over", "would roll", Shows::Nothing},
    {"log", "logs", Shows::Text},
    {"print_error", "prints", Shows::Value},
    {"print_output", "prints", Shows::Value},
};
static_assert(std::size(kPhrases) == static_cast<std::size_t>(Kind::OutputText) + 1);

const Phrase& phraseOf(Kind kind) {
  return kPhrases[static_cast<std::size_t>(kind)];
}

bool isRead(Kind kind) {
  return kind < Kind::SetPreference;
}

std::string submissionText(const OverlayEvent& event) {
  const plist::Dictionary log = event.value.dictionary();
  std::string text = format("%s, type %s, %s", event.subject, *log.string("type"),
                            sizeText(log.number("bytes")->real()));
  if (const auto options = log.dictionary("options")) {
    text += format(", options %s", inlineText(options));
  }
  if (log.get("withheld")) text += ", withheld: it is never sent";
  return text;
}

std::string valueText(const plist::Value& value, Shows shows) {
  if (!value || (value.array() && value.array().empty())) return "none";
  if (const auto number = value.number(); number && shows >= Shows::Bytes) {
    return shows == Shows::Bytes ? sizeText(number->real())
                                 : counted(static_cast<std::uint64_t>(number->int64()), "row");
  }
  const auto text = value.string();
  if (text && shows != Shows::Value) return std::string(*text);
  return inlineText(value);
}

std::string lineOf(const OverlayEvent& event) {
  const Phrase& phrase = phraseOf(event.kind);
  std::string line = phrase.text;
  line += ' ';
  if (event.kind == Kind::Submission) return line + submissionText(event);
  line += event.subject;
  if (phrase.shows == Shows::Nothing) return line;
  const bool isSet = event.kind == Kind::SetPreference || event.kind == Kind::SetScalar;
  line += isSet ? " = " : ": ";
  return line + valueText(event.value, phrase.shows);
}

/// One line of a step, and how often it occurred.
struct StepLine {
  Kind kind;
  std::string text;
  std::string content;  // of a log
  std::uint64_t times = 1;
};

// Repeated reads appear once, where the first occurred. Records are only counted.
std::vector<StepLine> linesOf(const RehearsedStep& step, bool verbose) {
  std::vector<StepLine> lines;
  std::map<std::string, std::size_t> reads;  // the position of a line
  for (const OverlayEvent& event : step.events) {
    const bool isDebug = event.kind == Kind::LogLine && event.subject == "debug";
    if (isDebug && !verbose) continue;
    StepLine line{event.kind, lineOf(event), {}};
    if (event.kind == Kind::Record && !verbose) line.text = event.subject;
    if (event.kind == Kind::Submission) {
      line.content = event.value.dictionary().string("content").value_or("");
    }
    const auto at = isRead(event.kind) ? reads.try_emplace(line.text, lines.size()).first->second
                                       : lines.size();
    if (at < lines.size()) {
      ++lines[at].times;
    } else if (event.kind == Kind::Record && !verbose && !lines.empty() &&
               lines.back().kind == event.kind && lines.back().text == line.text) {
      ++lines.back().times;
    } else {
      lines.push_back(std::move(line));
    }
  }
  for (StepLine& line : lines) {
    if (line.kind == Kind::Record && !verbose) {
      line.text = format("would file %s of %s", counted(line.times, "record"), line.text);
    } else if (line.times > 1) {
      line.text += format(" (%llu times)", line.times);
    }
  }
  return lines;
}

void printContent(std::ostream& out, std::string_view content) {
  while (!content.empty()) {
    const std::size_t end = std::min(content.find('\n'), content.size());
    std::string line(content.substr(0, end));
    const std::size_t tabs = std::min(line.find_first_not_of('\t'), line.size());
    line.replace(0, tabs, std::string(2 * tabs, ' '));
    out << "    | " << printable(line) << '\n';
    content.remove_prefix(std::min(end + 1, content.size()));
  }
}

void printStep(std::ostream& out, const RehearsedStep& step, bool verbose) {
  out << '\n' << step.title << '\n';
  const std::vector<StepLine> lines = linesOf(step, verbose);
  for (auto line = lines.begin(); line != lines.end();) {
    const auto end = std::find_if(line, lines.end(),
                                  [line](const StepLine& next) { return next.kind != line->kind; });
    const auto count = static_cast<std::size_t>(end - line);
    const auto shown = verbose || count <= kShownInARow ? end : line + kShownInARow - 1;
    const Kind kind = line->kind;
    for (; line != shown; ++line) {
      out << "  " << printable(line->text) << '\n';
      if (verbose) printContent(out, line->content);
    }
    if (line != end) {
      out << format("  %s: %lld more\n", phraseOf(kind).text, std::int64_t{end - line});
    }
    line = end;
  }
}

using Totals = std::map<Kind, std::uint64_t>;

Totals totalsOf(const Rehearsal& rehearsal) {
  Totals totals;
  for (const RehearsedStep& step : rehearsal.steps) {
    for (const OverlayEvent& event : step.events) {
      if (phraseOf(event.kind).counted != nullptr) ++totals[event.kind];
    }
  }
  return totals;
}

std::string summaryOf(const Totals& totals) {
  std::string text;
  for (const auto& [kind, count] : totals)
    text += format("%s%s", text.empty() ? "" : ", ", counted(count, phraseOf(kind).counted));
  return text.empty() ? "nothing" : text;
}

/// Reports errors of the system that a real run would also have met.
void failOnErrors(ToolContext& context, const Rehearsal& rehearsal) {
  std::uint64_t errors = 0;
  std::string first;
  for (const RehearsedStep& step : rehearsal.steps) {
    for (const OverlayEvent& event : step.events) {
      if (event.kind != Kind::LogLine || event.subject != "error") continue;
      if (errors++ == 0) first = event.value.string().value_or("");
    }
  }
  if (errors == 0) return;
  context.fail(format("the run would log %s; the first: %s", counted(errors, "error"), first));
}

std::string_view nameOf(RehearsedRun run) {
  constexpr std::string_view kNames[] = {"gated", "forced", "today"};
  return kNames[static_cast<std::size_t>(run)];
}

void print(ToolContext& context, const Rehearsal& rehearsal, RehearsedRun run, bool verbose) {
  std::ostream& out = context.out();
  out << format("Rehearsal of the %s run for day %s. Nothing is changed.\n",
                run == RehearsedRun::Gated ? "gated" : "forced", dayText(rehearsal.day));
  for (const RehearsedStep& step : rehearsal.steps)
    printStep(out, step, verbose);
  const Totals totals = totalsOf(rehearsal);
  out << "\nIn total it would write: " << summaryOf(totals) << '\n';
  if (!verbose && !totals.empty()) out << "--verbose shows everything, with the content of logs.\n";
  out << format("It would file %s\n",
                rehearsal.logOutcome
                    ? logOutcomeText(*rehearsal.logOutcome, dayText(rehearsal.day))
                    : format("no log: the run for day %s is already done", dayText(rehearsal.day)));
}

Json documentOf(const Rehearsal& rehearsal, RehearsedRun run) {
  Json steps = Json::array();
  for (const RehearsedStep& step : rehearsal.steps) {
    Json events = Json::array();
    for (const OverlayEvent& event : step.events) {
      events.push_back({{"event", phraseOf(event.kind).name},
                        {"subject", event.subject},
                        {"value", jsonOf(event.value)}});
    }
    steps.push_back({{"step", step.title}, {"events", std::move(events)}});
  }
  Json totals = Json::object();
  for (const auto& [kind, count] : totalsOf(rehearsal))
    totals[phraseOf(kind).name] = count;
  return {
      {"run", nameOf(run)},
      {"day", rehearsal.day},
      {"date", dayDateText(rehearsal.day)},
      {"steps", std::move(steps)},
      {"totals", std::move(totals)},
      {"log_outcome", rehearsal.logOutcome ? Json(nameOf(*rehearsal.logOutcome)) : Json(nullptr)}};
}

struct Arguments {
  bool forced = false;
  bool today = false;
  bool verbose = false;
};

}  // namespace

void addRehearseCommand(Command app, ToolContext& context) {
  const Command command = app.addCommand(
      "rehearse", "Show what a daily run would read and write, without changing anything");
  const auto arguments = std::make_shared<Arguments>();
  const Option forced = command.addFlag("--forced", arguments->forced,
                                        "The daily tasks for yesterday, done or not (tavrel -f)");
  command.addFlag("--today", arguments->today, "The daily tasks for today (tavrel -t)")
      .excludes(forced);
  command.addFlag("-v,--verbose", arguments->verbose,
                  "Show every event, debug messages and the content of logs");
  context.addJsonOption(command);
  command.onRun([&context, arguments] {
    RehearsedRun run = RehearsedRun::Gated;
    if (arguments->forced) run = RehearsedRun::Forced;
    if (arguments->today) run = RehearsedRun::Today;
    const Rehearsal rehearsal = rehearse(context.linuxPlatform(), run);
    if (context.json()) {
      context.printJson(documentOf(rehearsal, run));
    } else {
      print(context, rehearsal, run, arguments->verbose);
    }
    failOnErrors(context, rehearsal);
    for (const std::string& line : rehearsal.missingValues)
      context.fail(line);
  });
}

}  // namespace tavrel
