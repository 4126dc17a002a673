#include "fleet/commands/page_command.h"

#include <filesystem>

#include "base/format.h"
#include "fleet/commands/question.h"
#include "fleet/pages/fleet_page.h"
#include "tools/console/output_file.h"

namespace tavrel::fleet {
namespace {

struct PageOptions : QuestionOptions {
  std::string output;
};

}  // namespace

void addPageCommand(Command top, FleetContext& context) {
  const Command command = top.addCommand("page", "Write the fleet on one HTML page");
  auto options = std::make_shared<PageOptions>();
  command.addOption("-o,--output", options->output, "The page; - is standard output")
      .typeName("FILE")
      .required();
  addQuestionOptions(command, *options);
  command.onRun([&context, options] {
    if (const Status usable = checkOutput(options->output); !usable) {
      return context.fail(usable.error().message);
    }
    // Where no path leads to the database, it is on a server.
    std::error_code missing;
    if (std::filesystem::equivalent(options->output, context.database(), missing)) {
      return context.failUsage(
          format("--output: %s is the database: name another file", options->output));
    }
    ask(context, *options, [&](Question& question) {
      const std::string text =
          textOf(askForPage(question.engine(), question.ledger(), question.days()));
      if (const Status written = writeOutput(context, options->output, text); !written) {
        context.fail(written.error().message);
      }
    });
  });
}

}  // namespace tavrel::fleet
