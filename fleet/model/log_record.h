// One submitted log as rows of the fleet's tables. docs/log.md describes the log itself.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "fleet/model/text_arena.h"

namespace tavrel::fleet {

struct ScalarRow {
  std::string_view key;
  std::int64_t value = 0;
};

/// The summary of a series. `squaredDeviations` is the sum of squared deviations from the mean, not
/// divided by the count.
struct FiveNumbers {
  double minimum = 0;
  double maximum = 0;
  double mean = 0;
  double squaredDeviations = 0;
  std::uint64_t count = 0;
};

struct DistributionRow {
  std::string_view key;
  FiveNumbers numbers;
};

/// One bucket of a histogram: the values above `lower`, up to and including `upper`.
struct CellRow {
  std::string_view key;
  double lower = 0;  // -inf for the first bucket
  double upper = 0;  // inf for the last one, which also counts not-a-number
  std::string_view label;
  std::uint64_t count = 0;
};

struct ApplicationRow {
  std::string_view bundle;
  std::string_view version;
  std::string_view uuid;
  std::int64_t orboID = 0;
  std::int64_t arch = 0;
};

struct LogRecord {
  /// SHA-256 of the content, the same in every encoding; identifies a log that comes twice
  std::array<std::byte, 32> digest{};
  std::int32_t day = 0;      // the reported day, in days since 1970 UTC
  std::int64_t created = 0;  // seconds since 1970 UTC

  // Texts live in the arena. Whatever a log or its metadata does not say is empty.
  std::string_view osVersion;
  std::string_view previousOsVersion;  // differs from `osVersion` in the first log after an update
  std::string_view configNumber;
  std::string_view whitelistDigest;
  std::string_view taskID;
  std::string_view language;
  std::string_view preferredLanguage;
  std::string_view region;

  // Each key occurs once, and so does each label within a key.
  std::vector<ScalarRow> scalars;
  std::vector<DistributionRow> distributions;
  std::vector<CellRow> cells;
  std::vector<ApplicationRow> applications;

  TextArena texts;
};

}  // namespace tavrel::fleet
