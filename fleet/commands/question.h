// What the commands that ask questions share: their options, the database they ask, and the forms
// of their answers.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "fleet/commands/fleet_context.h"
#include "fleet/questions/ledger.h"
#include "fleet/questions/log_table.h"

namespace tavrel::fleet {

struct QuestionOptions {
  std::string days;  // empty without one
  std::optional<std::uint32_t> devicesAtLeast;
  bool csv = false;
};

/// Adds --days and --devices-at-least.
void addQuestionOptions(Command command, QuestionOptions& options);
/// Adds --json and --csv, of which at most one may be given. Returns --json.
Option addFormOptions(Command command, FleetContext& context, QuestionOptions& options);

/// An argument that only the database can judge is wrong: the text for `failUsage`.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// One run's view of the database.
class Question {
 public:
  /// Throws EngineError, and UsageError for options that make no sense.
  Question(FleetContext& context, const QuestionOptions& options);

  Engine& engine() { return *engine_; }
  const LogTable& table() const { return table_; }
  Ledger& ledger() { return ledger_; }
  const DayRange& days() const { return days_; }

  DayRange readDays(std::string_view text) const;
  /// The version that the text names: whole, or by a part that no other version has. Throws
  /// std::runtime_error, with a line for people.
  std::string readVersion(std::string_view text) const;

 private:
  std::unique_ptr<Engine> engine_;
  LogTable table_;
  Ledger ledger_;
  DayRange days_;
};

/// Runs a question and turns UsageError into a usage failure.
void ask(FleetContext& context, const QuestionOptions& options,
         const std::function<void(Question& question)>& run);

/// "fewer than 10 devices: nothing is shown".
std::string tooFewText(std::size_t devicesAtLeast);
/// A sentence on groups that are shown as one; empty without.
std::string joinedText(std::size_t joined, bool hasGroups, std::size_t devicesAtLeast);

/// What a column of counts of logs without a mean says.
std::string noMeanText();

/// What stands for a part in JSON and CSV: "all", "value", "not_told" or "other".
const char* kindText(const PartName& name);
/// The members "part" and "group", which is null but for values.
Json partJson(const PartName& name);
/// A number for people: "-" for what is not available.
std::string figureText(double value);

/// A number for JSON: what is not finite is null there.
Json realJson(double value);
/// {"first": "2026-11-01", "last": "2026-11-07"}, with null for an open end.
Json daysJson(const DayRange& days);

}  // namespace tavrel::fleet
