// What the question commands share: their options, the database that they query, and the
// formatting of their answers.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "fleet/commands/fleet_context.h"
#include "fleet/questions/ledger.h"
#include "fleet/questions/log_table.h"
#include "fleet/questions/part_name.h"

namespace tavrel::fleet {

struct QuestionOptions {
  std::string days;  // empty when not given
  std::optional<std::uint32_t> devicesAtLeast;
  bool csv = false;
};

/// Adds --days and --devices-at-least.
void addQuestionOptions(Command command, QuestionOptions& options);
/// Adds --json and --csv, of which at most one may be given. Returns --json.
Option addFormOptions(Command command, FleetContext& context, QuestionOptions& options);

/// An argument is wrong, but only the database could show that. The text goes to `failUsage`.
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
  /// Those of --days; all without it, or when it is a number of days and no day has enough devices.
  DayRange days() const { return days_.value_or(DayRange{}); }
  /// Whether --days is a number of days, but no day has enough devices.
  bool lacksDays() const { return !days_; }

  /// A number of days ends with the newest day that has enough devices. Without such a day returns
  /// nothing: then nothing can be shown, not even the day of a log. Throws UsageError.
  std::optional<DayRange> readDays(std::string_view text) const;
  /// Those of enough devices, by number.
  const std::vector<std::string>& versions() const { return versions_; }
  /// The one of these that the text names, either in full or by a part that no other one contains.
  /// Throws std::runtime_error with a readable line.
  std::string readVersion(std::string_view text) const;

 private:
  std::unique_ptr<Engine> engine_;
  LogTable table_;
  Ledger ledger_;
  const std::vector<std::string> versions_;
  std::optional<DayRange> days_ = DayRange{};
};

/// Runs a question and turns UsageError into a usage failure.
void ask(FleetContext& context, const QuestionOptions& options,
         const std::function<void(Question& question)>& run);

/// "is in no log, or in logs of fewer than 10 devices": a message that hides which.
std::string inFewLogsText(std::size_t devicesAtLeast);
/// "fewer than 10 devices: nothing is shown".
std::string tooFewText(std::size_t devicesAtLeast);
/// A sentence about groups that are shown as one; empty when there are none.
std::string joinedText(std::size_t joined, bool hasGroups, std::size_t devicesAtLeast);

/// The text for a column that counts logs without a mean.
std::string noMeanText();

/// The kind of a statistic in answers: "scalar", "distribution" or "histogram".
const char* kindText(KeyKind kind);
/// The kind of a part in JSON and CSV: "all", "value", "not_reported" or "other".
const char* kindText(const PartName& name);
/// The members "part" and "group"; the group is null unless the part is a value.
Json partJson(const PartName& name);
/// A number for people; "-" when it is not available.
std::string figureText(double value);

/// A number for JSON; null when it is not finite.
Json realJson(double value);
/// {"first": "2026-11-01", "last": "2026-11-07"}, with null for an open end.
Json daysJson(const DayRange& days);

}  // namespace tavrel::fleet
