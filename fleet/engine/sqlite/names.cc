#include "fleet/engine/sqlite/names.h"

#include "fleet/engine/sqlite/row_id.h"

namespace tavrel::fleet {
namespace {

constexpr const char* kNewKeys = "SELECT id, kind, name FROM key WHERE id > ?1 ORDER BY id";
constexpr const char* kAddKey = "INSERT INTO key(id, kind, name) VALUES(?1, ?2, ?3)";

constexpr const char* kNewBuckets = "SELECT id, key, label FROM bucket WHERE id > ?1 ORDER BY id";
constexpr const char* kAddBucket =
    "INSERT INTO bucket(id, key, lower, upper, label) VALUES(?1, ?2, ?3, ?4, ?5)";

constexpr const char* kNewApplications =
    "SELECT id, bundle, version, uuid, orbo_id, arch FROM application WHERE id > ?1 ORDER BY id";
constexpr const char* kAddApplication =
    "INSERT INTO application(id, bundle, version, uuid, orbo_id, arch) "
    "VALUES(?1, ?2, ?3, ?4, ?5, ?6)";

// Encodes a tuple as one text. Each part but the last has its length, so no two tuples collide.
void join(std::string& out, std::int64_t number) {
  out.append(reinterpret_cast<const char*>(&number), sizeof number);
}

void join(std::string& out, std::string_view text) {
  join(out, static_cast<std::int64_t>(text.size()));
  out += text;
}

template <class... Parts>
std::string_view joined(std::string& out, Parts... parts) {
  out.clear();
  (join(out, parts), ...);
  return out;
}

}  // namespace

std::optional<std::int64_t> NumbersOfTexts::find(std::string_view text) {
  if (entries_.empty()) return {};
  std::size_t& expected = entries_[last_].follower;
  if (entries_[expected].text != text) {
    const auto found = places_.find(text);
    if (found == places_.end()) return {};
    expected = found->second;
  }
  last_ = expected;
  return entries_[last_].number;
}

void NumbersOfTexts::add(std::string_view text, std::int64_t number) {
  const std::string_view kept = texts_.keep(text);
  places_.emplace(kept, entries_.size());
  entries_.push_back({kept, number, 0});
}

Names::Names(const Connection& connection)
    : connection_(connection),
      keys_(connection, kNewKeys, kAddKey),
      buckets_(connection, kNewBuckets, kAddBucket),
      applications_(connection, kNewApplications, kAddApplication) {}

std::int64_t Names::Table::next(const Connection& connection) {
  if (highest + 1 >= kMaxNames) {
    throw EngineError(connection.path() + ": has room for " + std::to_string(kMaxNames) +
                      " names and no more: load the logs into a new file");
  }
  return ++highest;
}

void Names::refresh() {
  const auto read = [](Table& table, const auto& add) {
    table.news.bind(1, table.highest);
    while (table.news.step()) {
      table.highest = table.news.integer(0);
      add(table.news, table.highest);
    }
    table.news.reset();
  };
  read(keys_, [&](const Statement& row, std::int64_t id) {
    const auto kind = static_cast<std::size_t>(row.integer(1));
    if (kind < keyNumbers_.size()) keyNumbers_[kind].add(row.text(2), id);
  });
  read(buckets_, [&](const Statement& row, std::int64_t id) {
    bucketNumbers_.add(joined(text_, row.integer(1), row.text(2)), id);
  });
  read(applications_, [&](const Statement& row, std::int64_t id) {
    applicationNumbers_.add(
        joined(text_, row.text(1), row.text(2), row.text(3), row.integer(4), row.integer(5)), id);
  });
}

std::int64_t Names::key(KeyKind kind, std::string_view name) {
  NumbersOfTexts& numbers = keyNumbers_[static_cast<std::size_t>(kind)];
  if (const auto known = numbers.find(name)) return *known;
  const std::int64_t id = keys_.next(connection_);
  keys_.addition.bind(1, id);
  keys_.addition.bind(2, static_cast<std::int64_t>(kind));
  keys_.addition.bind(3, name);
  keys_.addition.run();
  numbers.add(name, id);
  return id;
}

std::int64_t Names::bucket(const CellRow& cell) {
  const std::int64_t key = this->key(KeyKind::Histogram, cell.key);
  const std::string_view text = joined(text_, key, cell.label);
  if (const auto known = bucketNumbers_.find(text)) return *known;
  const std::int64_t id = buckets_.next(connection_);
  buckets_.addition.bind(1, id);
  buckets_.addition.bind(2, key);
  buckets_.addition.bind(3, cell.lower);
  buckets_.addition.bind(4, cell.upper);
  buckets_.addition.bind(5, cell.label);
  buckets_.addition.run();
  bucketNumbers_.add(text, id);
  return id;
}

std::int64_t Names::application(const ApplicationRow& application) {
  const std::string_view text = joined(text_, application.bundle, application.version,
                                       application.uuid, application.orboID, application.arch);
  if (const auto known = applicationNumbers_.find(text)) return *known;
  const std::int64_t id = applications_.next(connection_);
  applications_.addition.bind(1, id);
  applications_.addition.bind(2, application.bundle);
  applications_.addition.bind(3, application.version);
  applications_.addition.bind(4, application.uuid);
  applications_.addition.bind(5, application.orboID);
  applications_.addition.bind(6, application.arch);
  applications_.addition.run();
  applicationNumbers_.add(text, id);
  return id;
}

}  // namespace tavrel::fleet
