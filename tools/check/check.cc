#include "tools/check/check.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/arithmetic.h"
#include "base/instant.h"
#include "platform/platform.h"
#include "tools/check/checks.h"
#include "tools/console/table.h"

namespace tavrel {

std::string_view nameOf(CheckState state) {
  switch (state) {
    case CheckState::Ok:
      return "OK";
    case CheckState::Warning:
      return "WARNING";
    case CheckState::Critical:
      return "CRITICAL";
    case CheckState::Unknown:
      break;
  }
  return "UNKNOWN";
}

CheckState graver(CheckState a, CheckState b) {
  constexpr int kWeights[] = {0, 2, 3, 1};
  return kWeights[static_cast<int>(a)] >= kWeights[static_cast<int>(b)] ? a : b;
}

CheckState stateOfAge(std::int64_t seconds) {
  if (seconds >= kCriticalAge) return CheckState::Critical;
  return seconds >= kWarningAge ? CheckState::Warning : CheckState::Ok;
}

std::int64_t CheckScene::ageOf(plist::Date date) const {
  return ageOf(wholeSeconds(date));
}

void addFinding(Check& check, CheckState state, std::string_view text) {
  check.state = graver(check.state, state);
  if (!check.text.empty()) check.text += "; ";
  const std::size_t added = check.text.size();
  check.text += text;
  std::replace(check.text.begin() + static_cast<std::ptrdiff_t>(added), check.text.end(), '\n',
               ' ');
}

std::vector<Check> checkDevice(ToolContext& context, std::chrono::milliseconds examination) {
  std::vector<Check> checks;
  Platform& platform = context.platform();
  CheckScene scene{context, wholeSeconds(platform.clock->now()),
                   platform.statistics->BHDaysSince1970(), examination, checks};
  for (const auto check : {checkPermission, checkClock, checkLastRun, checkLastLog, checkStore,
                           checkRecording, checkQueues, checkUpload, checkDisks}) {
    check(scene);
  }
  return checks;
}

namespace {

constexpr std::chrono::milliseconds kThoroughExamination{1000};

CheckState gravest(const std::vector<Check>& checks) {
  CheckState state = CheckState::Ok;
  for (const Check& check : checks)
    state = graver(state, check.state);
  return state;
}

// JSON has the names in lower case.
std::string jsonNameOf(CheckState state) {
  std::string name(nameOf(state));
  for (char& letter : name)
    letter = static_cast<char>(letter | 0x20);
  return name;
}

Json jsonOf(const Check& check) {
  Json figures = Json::object();
  for (const CheckFigure& figure : check.figures) {
    const auto whole = saturatingInt64(figure.value);
    figures[std::string(figure.kind->name)] =
        static_cast<double>(whole) == figure.value ? Json(whole) : Json(figure.value);
  }
  return {{"name", check.name},
          {"subject", check.subject.empty() ? Json(nullptr) : Json(check.subject)},
          {"state", jsonNameOf(check.state)},
          {"text", check.text},
          {"figures", std::move(figures)}};
}

Emphasis emphasisOf(CheckState state) {
  return state == CheckState::Ok ? Emphasis::None : Emphasis::Alarm;
}

void print(ToolContext& context, const std::vector<Check>& checks) {
  for (const Check& check : checks) {
    context.out() << context.page().styled(nameOf(check.state), emphasisOf(check.state)) << ' '
                  << check.name;
    if (!check.subject.empty()) context.out() << ' ' << printable(check.subject);
    context.out() << ": " << printable(check.text) << '\n';
  }
}

}  // namespace

void showChecks(ToolContext& context) {
  // A failure of this tool must not look like a warning to a monitoring system.
  context.setFailureStatus(static_cast<int>(CheckState::Unknown));
  const std::vector<Check> checks = checkDevice(context, kThoroughExamination);
  const CheckState state = gravest(checks);
  if (context.json()) {
    Json list = Json::array();
    for (const Check& check : checks)
      list.push_back(jsonOf(check));
    context.printJson({{"state", jsonNameOf(state)}, {"checks", std::move(list)}});
  } else {
    print(context, checks);
  }
  context.setExitStatus(static_cast<int>(state));
}

}  // namespace tavrel
