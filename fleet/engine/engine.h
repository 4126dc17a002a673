// Keeps the fleet's logs: tables in a database, filled with records and read as rows.
//
// An engine stores and finds rows. It does no floating-point arithmetic, so results computed from
// its rows have the same bits with every engine. Every operation throws EngineError when the
// database fails; whatever was appended before stays.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// Its text is one line: what failed, where, and what to do.
class EngineError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

enum class OpenMode : std::uint8_t {
  Read,   // the database must exist
  Write,  // makes the database or its tables when they are missing
};

/// Identifies a log within one database; other databases number theirs differently.
using LogId = std::uint64_t;

/// What questions need of a log; the tables have more. Texts are valid only during the call that
/// hands out the row.
struct LogRow {
  LogId log = 0;
  std::int32_t day = 0;
  std::string_view osVersion;
  std::string_view whitelistDigest;
  std::string_view region;
};

struct ScalarValue {
  LogId log = 0;
  std::int64_t value = 0;
};

struct DistributionValue {
  LogId log = 0;
  FiveNumbers numbers;
};

struct CellValue {
  LogId log = 0;
  double lower = 0;
  double upper = 0;
  std::uint64_t count = 0;
};

enum class KeyKind : std::uint8_t { Scalar, Distribution, Histogram };

struct Key {
  std::string name;
  KeyKind kind = KeyKind::Scalar;
};

/// What a visitor throws when it needs no more rows. It ends the operation and does not reach the
/// caller.
struct EnoughRows {};

/// Rows come in blocks, in no particular order, each once. A visitor's other exceptions reach the
/// caller.
template <class Row>
using Visitor = std::function<void(std::span<const Row>)>;

class Engine {
 public:
  virtual ~Engine() = default;

  struct Appended {
    std::size_t added = 0;
    std::size_t known = 0;    // logs that were there before, or twice among the records
    std::vector<bool> isNew;  // of each record: whether it was added
  };

  /// Files each record whole or not at all, even when the process is killed. Several loaders may
  /// append at once; a log that two of them file counts once.
  virtual Appended append(std::span<const LogRecord> records) = 0;

  /// The logs of the days from `firstDay` to `lastDay`, both included.
  virtual void logs(std::int32_t firstDay, std::int32_t lastDay, const Visitor<LogRow>& visit) = 0;

  /// All keys that have rows, ordered by kind and name. Keys left by a load that was
  /// killed may also be among them.
  virtual std::vector<Key> keys() = 0;

  // Hand out all rows of one key, whatever their day; none for an unknown key. The caller must
  // ignore rows of logs that `logs` does not hand out: a load that was killed may have left some.
  virtual void scalars(std::string_view key, const Visitor<ScalarValue>& visit) = 0;
  virtual void distributions(std::string_view key, const Visitor<DistributionValue>& visit) = 0;
  virtual void cells(std::string_view key, const Visitor<CellValue>& visit) = 0;

  /// Another connection to the same tables, for a second thread.
  virtual std::unique_ptr<Engine> reader() = 0;
};

}  // namespace tavrel::fleet
