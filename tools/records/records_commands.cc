#include "tools/records/records_commands.h"

#include <algorithm>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <ostream>
#include <set>
#include <utility>
#include <vector>

#include "base/civil_time.h"
#include "base/format.h"
#include "base/quantity_text.h"
#include "base/text.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/record_file_name.h"
#include "tools/console/day_argument.h"
#include "tools/console/json_list.h"
#include "tools/console/table.h"
#include "tools/records/folder_watch.h"
#include "tools/records/record_reader.h"

namespace tavrel {
namespace {

struct Arguments {
  std::optional<std::uint32_t> type;
  std::string day;
  bool follow = false;
};

struct Selection {
  std::optional<std::uint32_t> type;
  std::optional<std::int32_t> day;
};

struct RecordFile {
  RecordFileName is;
  std::string path;
};

/// The selected files, by day and type.
Expected<std::vector<RecordFile>> recordFiles(ToolContext& context, const Selection& selection) {
  const std::string folder = context.root().path(kRecordFolder);
  const auto names = context.linuxPlatform().fileSystem().list(folder);
  if (!names) return names.error();
  std::vector<RecordFile> files;
  for (const std::string& name : *names) {
    const auto file = parseRecordFileName(name);
    if (!file || (selection.type && *selection.type != file->type) ||
        (selection.day && *selection.day != file->day)) {
      continue;
    }
    files.push_back({*file, folder + '/' + name});
  }
  std::stable_sort(files.begin(), files.end(), [](const RecordFile& a, const RecordFile& b) {
    return std::pair(a.is.day, a.is.type) < std::pair(b.is.day, b.is.type);
  });
  return files;
}

void list(ToolContext& context, const Selection& selection) {
  const auto files = recordFiles(context, selection);
  if (!files) return context.fail(files.error().message);
  constexpr auto kRight = Table::Align::Right;
  Table table({{"TYPE", kRight}, {"DAY"}, {"RECORDS", kRight}, {"SIZE", kRight}});
  Json entries = Json::array();
  for (const RecordFile& file : *files) {
    std::uint64_t records = 0;
    RecordReader reader(file.path);
    const Status read = reader.read(
        true, [&](std::string_view line, std::uint64_t) { records += line.empty() ? 0U : 1U; });
    if (!read) context.fail(read.error().message);
    if (const Status whole = reader.wholeness(); !whole) context.fail(whole.error().message);
    const auto status = FileSystem::status(file.path);
    const std::string date = dateText(civilFromDays(file.is.day));
    if (context.json()) {
      entries.push_back({{"type", file.is.type},
                         {"day", file.is.day},
                         {"date", date},
                         {"records", read ? Json(records) : Json(nullptr)},
                         {"bytes", status ? Json(status->st_size) : Json(nullptr)},
                         {"path", file.path}});
    } else {
      table.add({std::to_string(file.is.type), format("%lld (%s)", file.is.day, date),
                 read ? std::to_string(records) : "?",
                 status ? sizeText(static_cast<double>(status->st_size)) : "?"});
    }
  }
  if (context.json()) return context.printJson({{"files", std::move(entries)}});
  if (table.empty()) {
    context.out() << "no records\n";
  } else {
    table.print(context.page());
  }
}

/// Prints the records of a selection, each day's in the order of their times.
class RecordsView {
 public:
  RecordsView(ToolContext& context, const Selection& selection, bool follows)
      : context_(context), selection_(selection), follows_(follows) {}

  /// Prints what has arrived since the last call.
  void look() {
    const auto files = recordFiles(context_, selection_);
    if (!files) return tellOnce(files.error().message);
    std::vector<Row> rows;
    for (auto file = files->begin(); file != files->end();) {
      const std::int64_t day = file->is.day;
      for (; file != files->end() && file->is.day == day; ++file)
        readFile(*file, rows);
      hasPrinted_ = hasPrinted_ || !rows.empty();
      print(rows);
      rows.clear();
    }
    context_.out().flush();
    noteFaults();
  }

  void begin() {
    if (context_.json() && !follows_) document_.emplace(context_.out(), Json::object(), "records");
  }
  void end() {
    if (document_) {
      document_->end();
    } else if (!hasPrinted_ && !follows_ && context_.exitStatus() == kExitSuccess) {
      context_.out() << "no records\n";
    }
  }

 private:
  struct Row {
    std::string time;
    std::string type;
    std::string text;
  };

  void readFile(const RecordFile& file, std::vector<Row>& rows) {
    auto [reader, isNew] = readers_.try_emplace(file.path, file.path);
    const Status read =
        reader->second.read(!follows_, [&](std::string_view line, std::uint64_t number) {
          // Some editors begin a file with it, but a JSON document may not.
          constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
          if (line.starts_with(kByteOrderMark)) line.remove_prefix(kByteOrderMark.size());
          if (line.empty()) return;
          const auto record = parseRecord(line);
          if (!record) {
            if (faults_++ == 0) {
              firstFault_ =
                  format("line %llu of %s: %s", number, file.path, record.error().message);
            }
            return;
          }
          rows.push_back({record->time, textOf(record->type),
                          context_.json() ? std::string(line) : recordText(record->content)});
        });
    if (!read) tellOnce(read.error().message);
    if (const Status whole = reader->second.wholeness(); !whole) tellOnce(whole.error().message);
  }

  // Prints JSON exactly as it was filed, so that no digit of a number is lost.
  void print(std::vector<Row>& rows) {
    std::stable_sort(rows.begin(), rows.end(),
                     [](const Row& a, const Row& b) { return a.time < b.time; });
    std::ostream& out = context_.out();
    Table table({{""}, {"", Table::Align::Right}, {""}});
    for (Row& row : rows) {
      if (!context_.json()) {
        table.add({std::move(row.time), std::move(row.type), std::move(row.text)});
      } else if (document_) {
        document_->addText(row.text);
      } else {
        out << row.text << '\n';
      }
    }
    if (!table.empty()) table.print(context_.page());
  }

  void tellOnce(const std::string& message) {
    if (told_.insert(message).second) context_.fail(message);
  }

  void noteFaults() {
    if (faults_ == 0) return;
    context_.note(format("%s skipped, not a record; the first is %s",
                         counted(std::exchange(faults_, 0), "line"), firstFault_));
  }

  ToolContext& context_;
  const Selection selection_;
  const bool follows_;
  std::map<std::string, RecordReader> readers_;  // by path
  std::set<std::string> told_;
  bool hasPrinted_ = false;
  std::uint64_t faults_ = 0;
  std::string firstFault_;
  std::optional<JsonList> document_;
};

void show(ToolContext& context, const Selection& selection, bool follows) {
  RecordsView view(context, selection, follows);
  view.begin();
  if (follows) {
    const Status watched = watchFolder(context.root().path(kRecordFolder), [&] {
      view.look();
      return static_cast<bool>(context.out());
    });
    if (!watched) context.fail(watched.error().message);
  } else {
    view.look();
  }
  view.end();
}

Expected<Selection> selectionOf(ToolContext& context, const Arguments& arguments) {
  Selection selection{arguments.type, std::nullopt};
  if (arguments.day.empty()) return selection;
  const auto day = parseDay(arguments.day, context.platform().statistics->BHDaysSince1970());
  if (!day) return day.error();
  selection.day = *day;
  return selection;
}

void addSelectionOptions(Command command, Arguments& arguments) {
  command
      .addOption("--type", arguments.type,
                 "Only records of this type: 172 for ECC events, 176 for telemetry and defects")
      .typeName("N");
  command
      .addOption("--day", arguments.day,
                 "Only records of this day: today, yesterday, a day number or YYYY-MM-DD, UTC")
      .typeName("DAY");
}

}  // namespace

void addRecordsCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("records", "Show structured diagnostic records");

  const auto arguments = std::make_shared<Arguments>();
  const Command listCommand =
      group.addCommand("list", "List the files of records, by day and type");
  addSelectionOptions(listCommand, *arguments);
  context.addJsonOption(listCommand);
  listCommand.onRun([&context, arguments] {
    const auto selection = selectionOf(context, *arguments);
    if (!selection) return context.failUsage(selection.error().message);
    list(context, *selection);
  });

  const Command showCommand = group.addCommand("show", "Show records, oldest day first");
  addSelectionOptions(showCommand, *arguments);
  showCommand.addFlag(
      "-f,--follow", arguments->follow,
      "Keep printing new records until SIGINT or SIGTERM; with --json one per line");
  context.addJsonOption(showCommand);
  showCommand.onRun([&context, arguments] {
    const auto selection = selectionOf(context, *arguments);
    if (!selection) return context.failUsage(selection.error().message);
    show(context, *selection, arguments->follow);
  });
}

}  // namespace tavrel
