#include "platform/linux/folding/segment_fold.h"

#include <algorithm>
#include <limits>
#include <map>
#include <set>
#include <utility>
#include <vector>

#include "base/format.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/folding/fold_notes.h"
#include "platform/linux/folding/position_budget.h"
#include "platform/linux/folding/recorders.h"
#include "platform/linux/folding/scalar_changes.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/linux/folding/segment_intake.h"
#include "platform/linux/limits/device_limits.h"
#include "platform/linux/segments/writer_presence.h"

namespace tavrel {
namespace {

// Approximate size in the store of a row and of a value, in bytes.
constexpr std::int64_t kRowBytes = 160;
constexpr std::int64_t kValueBytes = 12;

// Why the segments of a user wait for a later fold.
constexpr std::string_view kManySegments =
    "there are more than a fold takes; record from fewer programs at a time";
constexpr std::string_view kManyValues =
    "the fold has taken as many measurements as it may; record fewer, or fold more often";
constexpr std::string_view kLargePositions =
    "what must be remembered of segments that are in use exceeds 1 MiB; record fewer keys, or from "
    "fewer programs at a time";
static_assert(limits::kPositionBytesPerUser == 1U << 20);

// A segment whose values the store takes, and what to do with it after the commit.
struct FoldedSegment {
  SegmentName name;
  OpenSegment segment;
  SegmentProgress progress;
  bool isOver;  // nobody can write to it, and nothing is left in it
};

class FoldRun {
 public:
  /// `storeBytes`: a store larger than this takes nothing from users other than root.
  FoldRun(const SegmentFolder& folder, SqliteStore& store, FoldNotes& notes,
          const Recorders& recorders, FoldReport& report, std::int64_t storeBytes)
      : folder_(folder),
        store_(store),
        notes_(notes),
        recorders_(recorders),
        report_(report),
        storeBytes_(storeBytes) {}

  Status run(const SegmentFolder::Listing& listing);
  /// Whether the run failed on a damaged store, which is now set aside.
  bool hasReplacedStore() const { return hasReplacedStore_; }

 private:
  Status fillBatch(SqliteBatch& batch, const SegmentFolder::Listing& listing);
  Status take(SqliteBatch& batch, const SegmentEntry& entry);
  Status takeValues(SqliteBatch& batch, OpenSegment segment, SegmentReader& reader,
                    const SegmentName& name, bool isWriterGone);
  /// The position as stored, and decoded. Nothing when no fold of this version can go on from it.
  struct Stored {
    std::string bytes;
    SegmentPosition position;
  };
  Expected<std::optional<Stored>> storedPosition(SqliteBatch& batch, const SegmentName& name);
  void count(const SegmentName& name, const SegmentIntake& intake, const SegmentProgress& progress);
  Status dropPositions(SqliteBatch& batch);
  /// Whether the values of a segment may be taken now. If not, notes why.
  bool admit(const SegmentName& name);
  /// Says that segments of a user exceed a limit. `limit` says which, and what to do.
  void logLimit(std::uint32_t owner, std::string_view limit);
  bool isStoreFull() const;
  void finishSegments();
  /// The refused files and values that this transaction counts: none while there is no day to count
  /// them under.
  std::uint64_t filesToCount() const { return boot_ ? notes_.uncountedFiles() : 0; }
  std::uint64_t valuesToCount() const {
    return boot_ ? notes_.uncountedValues() + counts_.refused : 0;
  }

  const SegmentFolder& folder_;
  SqliteStore& store_;
  FoldNotes& notes_;
  const Recorders& recorders_;
  FoldReport& report_;
  const std::int64_t storeBytes_;
  const BootInstant boot_ = currentBootInstant();

  FoldedRows rows_;
  PositionBudget positions_;
  SegmentNames found_;
  std::set<std::uint32_t> unseen_;    // users with segments of unknown identity
  std::vector<SegmentName> removed_;  // their positions would keep new segments waiting
  std::map<std::uint32_t, std::uint64_t> values_;
  std::set<std::uint32_t> namedUsers_;
  std::size_t next_ = 0;  // in the listing
  bool hasReplacedStore_ = false;

  // Of the current transaction.
  std::int64_t bytesBefore_ = 0;  // of the store
  std::size_t rowsBefore_ = 0;
  FoldReport counts_;
  ScalarChanges changes_;
  std::vector<FoldedSegment> folded_;
};

Status FoldRun::run(const SegmentFolder::Listing& listing) {
  for (const auto& [owner, count] : listing.leftOut) {
    unseen_.insert(owner);
    report_.waiting += count;
    logLimit(owner, kManySegments);
  }
  unseen_.insert(listing.linked.begin(), listing.linked.end());
  for (const std::string& line : listing.refusals)
    notes_.refuse(line);
  if (listing.segments.empty() && filesToCount() + valuesToCount() == 0) return Done{};
  do {
    auto batch = store_.beginBatch(Sharing::Avoided);
    if (!batch) return batch.error();
    // One damaged row must not keep all recorded values out of the store.
    (*batch)->refuseUnwritableSeries();
    Status done = fillBatch(**batch, listing);
    if (done) done = (*batch)->commit();
    if (!done) {
      Status replaced = store_.replaceDamaged(*std::move(batch), done.error());
      hasReplacedStore_ = static_cast<bool>(replaced);
      return replaced;
    }
    finishSegments();
  } while (next_ < listing.segments.size() || !removed_.empty());
  return Done{};
}

void FoldRun::logLimit(std::uint32_t owner, std::string_view limit) {
  notes_.logOnce(format("segments of user %u wait: %s", owner, limit));
}

Status FoldRun::fillBatch(SqliteBatch& batch, const SegmentFolder::Listing& listing) {
  if (Status done = positions_.load(batch); !done) return done;
  const auto bytes = batch.bytesInUse();
  if (!bytes) return bytes.error();
  bytesBefore_ = *bytes;
  rowsBefore_ = rows_.size();
  for (const SegmentName& name : std::exchange(removed_, {})) {
    if (Status done = positions_.removeEnd(batch, name); !done) return done;
  }
  while (next_ < listing.segments.size() && folded_.size() < limits::kFoldSegmentsAtOnce &&
         counts_.values < limits::kFoldValuesAtOnce && changes_.bytes() < limits::kFoldKeyBytes) {
    if (Status done = take(batch, listing.segments[next_++]); !done) return done;
  }
  if (next_ == listing.segments.size() && listing.isWhole) {
    if (Status done = dropPositions(batch); !done) return done;
  }
  if (Status done = changes_.giveTo(batch); !done) return done;
  const auto refused = batch.refusedValues();
  if (!refused) return refused.error();
  counts_.refused += changes_.overflows() + *refused;
  const std::pair<const char*, std::uint64_t> figures[] = {
      {"com.norvane.brimhold.dropped", counts_.dropped},
      {"com.norvane.brimhold.refused", valuesToCount()},
      {"com.norvane.brimhold.segments_refused", filesToCount()},
  };
  ScalarChanges own;
  for (const auto& [key, count] : figures) {
    if (count > 0) own.add(store_.BHDaysSince1970(), key, static_cast<std::int64_t>(count));
  }
  return own.giveTo(batch);
}

Status FoldRun::take(SqliteBatch& batch, const SegmentEntry& entry) {
  auto opening = folder_.openSegment(entry);
  if (!opening) return opening.error();
  if (!opening->segment) {
    if (opening->refusal.empty()) return Done{};
    unseen_.insert(entry.owner);
    notes_.refuse(opening->refusal);
    return Done{};
  }
  OpenSegment& segment = *opening->segment;
  const std::uint32_t owner = segment.entry.owner;
  SegmentReader reader(segment.file.get());
  // Ask first: only what is read after the last writer has gone is complete.
  const bool isWriterGone =
      findSegmentWriter(segment.file.get(), reader.facts()) == WriterPresence::Gone;
  const auto state = reader.state();
  if (Status done = reader.readable(); !done) return done;
  if (!state) {
    notes_.refuse(folder_.refusal(entry.name, state.error().message));
    return Done{};
  }
  if (*state == SegmentReader::State::Empty) {
    if (isWriterGone) folded_.push_back({{}, std::move(segment), {}, true});
    return Done{};
  }
  // Read again: at the first read, the process may not have written them yet.
  const SegmentName name{owner, reader.facts().identity};
  if (!found_.insert(name).second) {
    notes_.refuse(folder_.refusal(entry.name, "a copy of another segment"));
    return Done{};
  }
  if (!admit(name)) {
    ++report_.waiting;
    return Done{};
  }
  return takeValues(batch, std::move(segment), reader, name, isWriterGone);
}

bool FoldRun::isStoreFull() const {
  return bytesBefore_ + static_cast<std::int64_t>(counts_.values) * kValueBytes +
             static_cast<std::int64_t>(rows_.size() - rowsBefore_) * kRowBytes >
         storeBytes_;
}

bool FoldRun::admit(const SegmentName& name) {
  if (name.owner != 0 && isStoreFull()) {
    notes_.logOnce(
        "the statistics store is far beyond its limit: what users other than root record waits "
        "until days are reported and removed; see 'tavrelctl limits'");
    return false;
  }
  if (values_[name.owner] >= limits::kFoldValuesPerUser) {
    logLimit(name.owner, kManyValues);
    return false;
  }
  if (report_.values + counts_.values >= limits::kFoldValues) {
    notes_.logOnce(
        "segments wait: the fold has taken as many measurements of all users as it may; fold more "
        "often");
    return false;
  }
  if (positions_.admit(name)) return true;
  logLimit(name.owner, kManySegments);
  return false;
}

Status FoldRun::takeValues(SqliteBatch& batch, OpenSegment segment, SegmentReader& reader,
                           const SegmentName& name, bool isWriterGone) {
  auto stored = storedPosition(batch, name);
  if (!stored) return stored.error();
  if (!*stored) {
    notes_.logOnce("a segment of user " + std::to_string(name.owner) +
                   " waits: another version of this program began to fold it; restart the device");
    ++report_.waiting;
    return Done{};
  }
  auto& [before, position] = **stored;
  if (position.isEnd) {
    if (isWriterGone) {
      folded_.push_back({name, std::move(segment), {}, true});
    } else {
      notes_.refuse(folder_.refusal(segment.entry.name, "a copy of another segment"));
    }
    return Done{};
  }
  // A segment without a writer leaves only a mark, unless values wait for a date.
  if (!isWriterGone || !boot_) {
    const auto hasRoom =
        positions_.hasRoom(batch, name.owner, before.size(), reader.positionBytes());
    if (!hasRoom) return hasRoom.error();
    if (!*hasRoom) {
      logLimit(name.owner, kLargePositions);
      ++report_.waiting;
      return Done{};
    }
  }
  SegmentIntake intake(name.owner, recorders_, rows_, changes_, batch.waitingDistributions());
  // What may be wrongly refused must wait.
  SegmentLook look;
  SegmentSink& sink =
      recorders_.areRightsKnown(name.owner) ? static_cast<SegmentSink&>(intake) : look;
  SegmentProgress progress = reader.read(position, boot_, isWriterGone, sink);
  if (Status done = reader.readable(); !done) return done;
  if (look.hasValues()) {
    ++report_.waiting;
    ++report_.withoutRights;
    return Done{};
  }
  if (Status done = batch.limitWaiting(); !done) return done;
  const bool isOver = isWriterGone && progress.isComplete;
  if (isOver) position = SegmentPosition::end();
  if (Status done = positions_.store(batch, name, before, position.encode()); !done) return done;
  count(name, intake, progress);
  // The acknowledgement tells a program that dropped values that there may be room again.
  if (isOver || !progress.acknowledgements.empty() || progress.dropped > 0) {
    folded_.push_back({name, std::move(segment), std::move(progress), isOver});
  }
  return Done{};
}

Expected<std::optional<FoldRun::Stored>> FoldRun::storedPosition(SqliteBatch& batch,
                                                                 const SegmentName& name) {
  Stored stored;
  if (!positions_.known().contains(name)) return std::optional(std::move(stored));
  auto bytes = batch.segmentPosition(name.owner, name.identity);
  if (!bytes) return bytes.error();
  stored.bytes = bytes->value_or("");
  if (auto decoded = SegmentPosition::decode(stored.bytes)) {
    stored.position = *std::move(decoded);
  } else if (!stored.bytes.empty()) {
    return std::optional<Stored>();
  }
  return std::optional(std::move(stored));
}

void FoldRun::count(const SegmentName& name, const SegmentIntake& intake,
                    const SegmentProgress& progress) {
  if (!intake.foreignKey().empty() && namedUsers_.insert(name.owner).second) {
    notes_.logOnce(
        format("user %u may not record %s, and such values are refused: give the user a "
               "prefix in /etc/tavrel/recorders.plist, or use another key",
               name.owner, quotedText(std::string_view(intake.foreignKey()).substr(0, 80))));
  }
  ++counts_.segments;
  counts_.scalars += intake.scalars();
  counts_.values += intake.values();
  values_[name.owner] += intake.values();
  counts_.refused += intake.refused() + progress.refused;
  counts_.dropped += std::min(progress.dropped, limits::kLargestDrop);
}

// Removes the positions of segments that an earlier fold removed or that a restart has erased.
Status FoldRun::dropPositions(SqliteBatch& batch) {
  for (const SegmentName& name : positions_.known()) {
    if (found_.contains(name) || unseen_.contains(name.owner)) continue;
    if (Status done = batch.removeSegmentPosition(name.owner, name.identity); !done) return done;
  }
  return Done{};
}

void FoldRun::finishSegments() {
  if (!folded_.empty()) notes_.mark();
  for (const FoldedSegment& folded : folded_) {
    if (folded.isOver) {
      if (!folder_.remove(folded.segment)) continue;
      ++counts_.removed;
      // An empty segment has no position.
      if (folded.name != SegmentName() && positions_.isHalfUsed(folded.name.owner)) {
        removed_.push_back(folded.name);
      }
      continue;
    }
    // Space that cannot be given back now is given back by the next fold.
    if (const Descriptor file = folder_.openToAcknowledge(folded.segment)) {
      static_cast<void>(acknowledge(file.get(), folded.progress));
    }
  }
  folded_.clear();
  changes_ = {};
  report_.segments += counts_.segments;
  report_.scalars += counts_.scalars;
  report_.values += counts_.values;
  report_.removed += counts_.removed;
  report_.dropped += counts_.dropped;
  report_.refused += counts_.refused;
  report_.segmentsRefused += filesToCount();
  if (boot_) {
    notes_.clearUncounted();
  } else {
    notes_.addUncountedValues(counts_.refused);
  }
  counts_ = {};
}

Status foldAll(const SegmentFolder& folder, SqliteStore& store, FoldNotes& notes,
               const Recorders& recorders, FoldReport& report, std::int64_t storeBytes,
               const SegmentFolder::Listing& listing) {
  FoldRun fold(folder, store, notes, recorders, report, storeBytes);
  Status done = fold.run(listing);
  if (!fold.hasReplacedStore()) return done;
  // The new store has no positions, and the values of earlier transactions are lost with the old
  // one.
  report.waiting = report.withoutRights = 0;
  return FoldRun(folder, store, notes, recorders, report, storeBytes).run(listing);
}

}  // namespace

FoldReport SegmentFold::run() {
  FoldReport report;
  const auto folder = SegmentFolder::open(root_);
  if (!folder) {
    report.failure = folder.error().message;
    return report;
  }
  if (!*folder) return report;
  report.hasFolder = true;
  // Also when this fold fails: a request that stays starts one fold after another.
  const Status cleared = (*folder)->clearRequest();
  auto notes = FoldNotes::lock(root_, files_, log_);
  if (!notes) {
    report.failure = notes.error().message;
    return report;
  }
  if (!cleared) notes->logOnce(cleared.error().message);
  const Expected<SegmentFolder::Listing> listing = (*folder)->list();
  if (!listing) {
    report.failure = listing.error().message;
  } else if (!listing->segments.empty() || !listing->refusals.empty() ||
             notes->uncountedValues() > 0) {
    const Recorders recorders = Recorders::read(root_, files_, propertyLists_, log_);
    // While the limits file has a fault, the bound of the store is unknown.
    const auto bounds = DeviceLimits::read(root_, files_, propertyLists_);
    const std::int64_t most = bounds
                                  ? bounds->of(Kept::Store).bytes / 100 * limits::kFoldStorePercent
                                  : std::numeric_limits<std::int64_t>::max();
    const Status done = foldAll(**folder, store_, *notes, recorders, report, most, *listing);
    if (!done) {
      report.failure = done.error().message + "; what programs recorded waits for the next fold";
    } else if (report.withoutRights > 0) {
      report.failure = root_.path(kRecordersFile) +
                       " cannot be read now, or names users who cannot be looked up; what users "
                       "other than root recorded waits for the next fold";
    }
  }
  notes->save();
  return report;
}

}  // namespace tavrel
