#include "tools/stat/stat_transfer.h"

#include <fstream>
#include <istream>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string_view>
#include <vector>

#include "base/format.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/platform.h"
#include "tools/console/table.h"
#include "tools/stat/import_lines.h"
#include "tools/stat/line_writer.h"
#include "tools/stat/recorded.h"
#include "tools/stat/stat_progress.h"

namespace tavrel {
namespace {

constexpr std::size_t kBlockBytes = 1U << 20;

struct Counts {
  std::uint64_t scalars = 0;
  std::uint64_t values = 0;
};

Status feedAll(std::istream& in, const std::string& name, std::int32_t today,
               const ImportParser::Sink& sink) {
  ImportParser parser(today);
  std::vector<char> block(kBlockBytes);
  Status fed = Done{};
  while (in && fed) {
    in.read(block.data(), static_cast<std::streamsize>(block.size()));
    fed = parser.feed({block.data(), static_cast<std::size_t>(in.gcount())}, sink);
  }
  if (in.bad()) return systemError("read", name);
  if (fed) fed = parser.finish(sink);
  if (!fed) return Error{format("%s:%llu: %s", name, parser.lines(), fed.error().message)};
  return fed;
}

void importStream(ToolContext& context, std::istream& in, const std::string& name) {
  auto batch = context.linuxPlatform().store().beginBatch();
  if (!batch) return context.fail(batch.error().message);
  Counts counts;
  StatProgress progress(context);
  const ImportParser::Sink sink = [&](const ImportLine& line) {
    progress.count(name, counts.scalars + counts.values);
    if (line.kind == ImportLine::Kind::Scalar) {
      ++counts.scalars;
      return (*batch)->setScalar(line.day, line.key, line.integer);
    }
    ++counts.values;
    return (*batch)->appendValue(line.day, line.key, line.seconds, line.value);
  };
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  if (const Status fed = feedAll(in, name, today, sink); !fed) {
    return context.fail(fed.error().message + "; nothing of the file was kept");
  }
  if (const Status kept = (*batch)->commit(); !kept) {
    return context.fail(format("%s; nothing of %s was kept", kept.error().message, name));
  }
  if (context.json()) {
    context.printJson({{"file", name}, {"scalars", counts.scalars}, {"values", counts.values}});
  } else {
    context.out() << printable(name) << ": " << counted(counts.scalars, "scalar") << ", "
                  << counted(counts.values, "value") << '\n';
  }
}

}  // namespace

void importStatistics(ToolContext& context, const std::string& file) {
  if (file == "-") return importStream(context, context.in(), "standard input");
  std::ifstream stream(file, std::ios::binary);
  if (!stream) return context.fail(systemError("open", file).message);
  importStream(context, stream, file);
}

void exportStatistics(ToolContext& context, const std::string& prefix,
                      std::optional<std::int32_t> day) {
  auto history = openRecorded(
      context,
      {.key = prefix, .firstDay = day.value_or(kFirstDay), .lastDay = day.value_or(kLastDay)});
  if (!history) return context.fail(history.error().message);

  StatProgress progress(context);
  LineWriter writer(context.out());
  std::uint64_t rows = 0;
  const auto canBeWritten = [&](std::string_view key) {
    progress.count("exported", ++rows);
    if (isExportable(key)) return true;
    context.fail(format(
        "not exported: the key \"%s\" is empty or contains a tab, a line end or bytes that are not "
        "UTF-8: read the store with sqlite3",
        printable(key.substr(0, 60))));
    return false;
  };
  Status walked = history->walkScalars(
      [&](std::string_view key, std::int32_t rowDay, std::int64_t value, bool& stop) {
        if (!canBeWritten(key)) return;
        appendScalarLine(writer.buffer(), rowDay, key, value);
        stop = !writer.flushIfLarge();
      });
  if (walked) {
    walked = history->walkDistributions([&](std::string_view key, std::int32_t rowDay, std::int64_t,
                                            BHHistoryDistributionEnumerator& values, bool& stop) {
      if (!canBeWritten(key)) return;
      double value = 0;
      std::uint32_t seconds = 0;
      while (!stop && values.getNextValue(value, seconds)) {
        appendValueLine(writer.buffer(), rowDay, key, seconds, value);
        stop = !writer.flushIfLarge();
      }
    });
    if (context.hasComplaints()) context.setExitStatus(kExitFailure);
  }
  if (!walked) context.fail(walked.error().message);
}

}  // namespace tavrel
