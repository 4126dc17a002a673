#include "tools/catalogue/catalogue_command.h"

#include <array>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>
#include <vector>

#include "base/format.h"
#include "catalogue/catalogue.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

using catalogue::Entry;
using catalogue::Kind;

struct KindText {
  Kind kind;
  std::string_view name;
  std::string_view title;
};
constexpr std::array<KindText, 3> kKinds = {{
    {Kind::Statistic, "statistic", "Statistics"},
    {Kind::Channel, "channel", "Report channels"},
    {Kind::Controller, "controller", "Statistics of a storage controller"},
}};

struct Found {
  const KindText* kind;
  const Entry* entry;
};

std::string textOf(std::string_view known) {
  return std::string(known.empty() ? "not known" : known);
}

// A name that is not the key of a statistic may belong to a controller, or to
// channels of several drivers.
std::vector<Found> findAll(const std::string& key) {
  std::vector<Found> found;
  const auto take = [&](const KindText& kind, const Entry* entry) {
    if (entry) found.push_back({&kind, entry});
  };
  take(kKinds[0], catalogue::findStatistic(key));
  if (!found.empty()) return found;
  const Entry* before = nullptr;
  for (const Entry& row : catalogue::entries(Kind::Channel)) {
    if (before && before->driver == row.driver && before->group == row.group) continue;
    before = &row;
    take(kKinds[1], catalogue::findChannel(row.driver, row.group, key));
  }
  take(kKinds[2], catalogue::findController(key));
  return found;
}

Json jsonOf(std::string_view key, const Found& found) {
  const auto known = [](std::string_view text) {
    return text.empty() ? Json(nullptr) : Json(text);
  };
  const auto& [kind, entry] = found;
  return {{"key", key},
          {"kind", kind->name},
          {"row", entry->key},
          {"driver", known(entry->driver)},
          {"group", known(entry->group)},
          {"unit", known(entry->unit)},
          {"since", known(nameOf(entry->since))},
          {"meaning", known(entry->meaning)}};
}

void print(ToolContext& context, const std::string& key, const Found& found) {
  const auto& [kind, entry] = found;
  Table table({{""}, {"", Table::Align::Whole}}, 2);
  table.add({"kind", std::string(kind->name)});
  if (kind->kind == Kind::Channel) {
    table.add({"driver", std::string(entry->driver)});
    table.add({"group", std::string(entry->group)});
  }
  if (entry->key != key) table.add({"row", std::string(entry->key)});
  table.add({"unit", textOf(entry->unit)});
  table.add({"since", textOf(nameOf(entry->since))});
  table.add({"meaning", textOf(entry->meaning)});
  context.out() << context.page().styled(printable(key), Emphasis::Strong) << '\n';
  table.print(context.page());
}

void show(ToolContext& context, const std::vector<std::string>& keys) {
  Json list = Json::array();
  for (const std::string& key : keys) {
    const std::vector<Found> found = findAll(key);
    if (found.empty()) {
      context.fail(format("no entry for %s: see 'tavrelctl catalogue'", printable(key)));
    }
    for (const Found& one : found) {
      if (context.json()) {
        list.push_back(jsonOf(key, one));
      } else {
        print(context, key, one);
      }
    }
  }
  if (context.json()) context.printJson({{"entries", std::move(list)}});
}

void printAll(ToolContext& context, const KindText& kind) {
  const bool isChannel = kind.kind == Kind::Channel;
  std::vector<Table::Column> columns = {
      {"KEY", Table::Align::Whole}, {"UNIT"}, {"SINCE"}, {"MEANING"}};
  if (isChannel) columns.insert(columns.begin(), {{"DRIVER"}, {"GROUP"}});
  Table table(std::move(columns), 2);
  for (const Entry& row : catalogue::entries(kind.kind)) {
    std::vector<Table::Cell> cells;
    if (isChannel) cells = {std::string(row.driver), std::string(row.group)};
    cells.emplace_back(std::string(row.key));
    cells.emplace_back(textOf(row.unit));
    cells.emplace_back(std::string(nameOf(row.since)));
    cells.emplace_back(textOf(row.meaning));
    table.add(std::move(cells));
  }
  context.out() << context.page().styled(kind.title, Emphasis::Strong) << '\n';
  table.print(context.page());
}

void showAll(ToolContext& context) {
  Json list = Json::array();
  for (const KindText& kind : kKinds) {
    if (!context.json()) {
      if (kind.kind != Kind::Statistic) context.out() << '\n';
      printAll(context, kind);
      continue;
    }
    for (const Entry& row : catalogue::entries(kind.kind))
      list.push_back(jsonOf(row.key, {&kind, &row}));
  }
  if (context.json()) context.printJson({{"entries", std::move(list)}});
}

}  // namespace

void addCatalogueCommand(Command app, ToolContext& context) {
  struct Arguments {
    std::vector<std::string> keys;
  };
  const auto arguments = std::make_shared<Arguments>();
  const Command command =
      app.addCommand("catalogue", "Show what statistics and report channels mean, and their units");
  command.addOption("KEY", arguments->keys, "Keys, or names of channels (default: all)").notEmpty();
  context.addJsonOption(command);
  command.onRun([&context, arguments] {
    if (arguments->keys.empty()) {
      showAll(context);
    } else {
      show(context, arguments->keys);
    }
  });
}

}  // namespace tavrel
