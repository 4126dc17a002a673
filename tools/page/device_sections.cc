// The device itself: the head of the page, its health, and notes about the page.
#include <algorithm>

#include "base/format.h"
#include "base/version.h"
#include "page/table.h"
#include "platform/linux/logs/submission_permission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/platform.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/page/sections.h"

namespace tavrel {
namespace {

constexpr SectionLimit kCheckLimit{100, 50'000};

std::string_view styleOf(CheckState state) {
  switch (state) {
    case CheckState::Ok:
      return "good";
    case CheckState::Critical:
      return "bad";
    case CheckState::Warning:
    case CheckState::Unknown:
      break;
  }
  return "warn";
}

std::string_view wordOf(CheckState state) {
  switch (state) {
    case CheckState::Ok:
      return "Good";
    case CheckState::Warning:
      return "Warning";
    case CheckState::Critical:
      return "Critical";
    case CheckState::Unknown:
      break;
  }
  return "Unknown";
}

std::string capitalized(std::string text) {
  if (!text.empty() && text[0] >= 'a' && text[0] <= 'z') text[0] = static_cast<char>(text[0] - 32);
  return text;
}

// "permission", "queue outbox", "disk nvme0".
std::string titleOf(const Check& check) {
  std::string title(check.name);
  std::ranges::replace(title, '-', ' ');
  if (!check.subject.empty()) title += ' ' + check.subject;
  return capitalized(std::move(title));
}

std::string permissionText(const SubmissionPermission& permission) {
  if (!permission.isGiven) return "Not allowed";
  if (permission.isHeldBack()) return capitalized(textOf(permission));
  return permission.firstDay ? format("From %s on", dayDateText(*permission.firstDay)) : "Allowed";
}

std::string queuesText(const std::vector<Check>& checks) {
  std::string text;
  for (const Check& check : checks) {
    if (check.name != "queue" || check.text == "empty") continue;
    appendFormat(text, "%s%s: %s", text.empty() ? "" : "; ", check.subject, check.text);
  }
  return text.empty() ? "All empty" : capitalized(std::move(text));
}

std::vector<const Check*> gravestFirst(const std::vector<Check>& checks) {
  std::vector<const Check*> sorted;
  for (const CheckState state :
       {CheckState::Critical, CheckState::Warning, CheckState::Unknown, CheckState::Ok}) {
    for (const Check& check : checks)
      if (check.state == state) sorted.push_back(&check);
  }
  return sorted;
}

void writeVerdict(page::HtmlWriter& html, const std::vector<Check>& checks) {
  std::uint64_t counts[4] = {};
  CheckState state = CheckState::Ok;
  for (const Check& check : checks) {
    ++counts[static_cast<std::size_t>(check.state)];
    state = graver(state, check.state);
  }
  std::string text;
  constexpr const char* kWords[] = {"", "warning", "critical", "unknown"};
  for (const CheckState bad : {CheckState::Critical, CheckState::Warning, CheckState::Unknown}) {
    const auto index = static_cast<std::size_t>(bad);
    if (counts[index] == 0) continue;
    appendFormat(text, "%s%llu %s", text.empty() ? "" : ", ", counts[index], kWords[index]);
  }
  writeFact(html, "Checks",
            text.empty() ? format("All %zu good", checks.size())
                         : format("%s, of %zu", text, checks.size()),
            styleOf(state));
}

}  // namespace

void writeHead(PageScene& scene, const std::vector<Check>& checks) {
  page::HtmlWriter& html = scene.document.head();
  const SubmissionPermission permission = submissionPermission(scene.context.preferences());
  html.begin("dl");
  writeVerdict(html, checks);
  writeFact(html, "Logs may leave the device", permissionText(permission));
  writeFact(html, "Logs that wait", queuesText(checks));
  writeFact(html, "Day of the figures", dayText(scene.recorded.day));
  writeFact(html, "System", scene.osVersion.empty() ? "Not known" : scene.osVersion);
  writeFact(html, "tavrel", std::string(version()));
  html.end();
}

void writeHealth(PageScene& scene, const std::vector<Check>& checks) {
  page::HtmlWriter& html = scene.document.section("Health");
  const std::vector<const Check*> sorted = gravestFirst(checks);
  constexpr auto kPlain = page::Table::Align::Plain;
  page::Table table(html, "Health",
                    {{"Check", page::Table::Align::Name}, {"State", kPlain}, {"Finding", kPlain}});
  std::size_t written = 0;
  for (; written < checks.size() && !kCheckLimit.isReached(written, html); ++written) {
    const Check& check = *sorted[written];
    table.row();
    table.cell([&](page::HtmlWriter& cell) { cell.name(titleOf(check)); });
    table.cell([&](page::HtmlWriter& cell) {
      cell.element("span", wordOf(check.state), {{"class", styleOf(check.state)}});
    });
    table.cell([&](page::HtmlWriter& cell) { cell.name(check.text); });
  }
  table.end();
  writeLeftOut(html, checks.size() - written, "check", "tavrelctl status --check");
}

void writeNotes(PageScene& scene) {
  page::HtmlWriter& html = scene.document.section("About this page");
  html.element("p",
               "The figures of this page are exact, even those that leave the device in a coarser "
               "form or not at all: give the page only to people who may know them. What a log has "
               "is worked out with the current whitelist. Days are UTC days. The page loads "
               "nothing from a network and sends nothing.");
  const auto missing = [&html](std::string_view text) {
    html.begin("p", {{"class", "bad"}});
    html.name(text);
    html.end();
  };
  if (!scene.recorded.fault.empty()) missing("Something is missing: " + scene.recorded.fault);
  for (const std::string& error : scene.log.errors)
    missing("The log may lack something: " + error);
}

void writeFact(page::HtmlWriter& html, std::string_view term, std::string_view text,
               std::string_view style) {
  html.begin("div");
  html.element("dt", term);
  html.begin("dd", {{"class", style}});
  html.name(text);
  html.end();
  html.end();
}

void writeLeftOut(page::HtmlWriter& html, std::uint64_t count, std::string_view what,
                  std::string_view where) {
  if (count == 0) return;
  html.begin("p", {{"class", "note"}});
  html.text(format("Not shown for lack of space: %s; ", counted(count, what)));
  html.element("code", where);
  html.text(" has them all.");
  html.end();
}

}  // namespace tavrel
