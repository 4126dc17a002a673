// What one run has shown, and what it therefore must not show.
//
// A set of logs of fewer than K devices is never shown. Nor is one from which, together with what
// was shown before of the same subject, somebody could tell such a set by a subtraction.
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/questions/log_set.h"
#include "fleet/questions/part_name.h"

namespace tavrel::fleet {

inline constexpr std::size_t kDefaultDevicesAtLeast = 10;
/// Of two devices, the owner of one could tell the figures of the other.
inline constexpr std::size_t kFewestDevicesAtLeast = 3;

class Ledger {
 public:
  Ledger(const LogTable& table, std::size_t devicesAtLeast)
      : table_(table), devicesAtLeast_(devicesAtLeast) {}

  const LogTable& table() const { return table_; }
  std::size_t devicesAtLeast() const { return devicesAtLeast_; }
  bool hasEnough(const LogSet& logs) const { return logs.devices(table_) >= devicesAtLeast_; }

  /// Whether the set has enough devices, equals each shown set of the subject or differs from it by
  /// enough devices, and leaves nothing of too few devices when all its shown parts are taken away,
  /// from it or from a shown set that includes it.
  bool allows(const std::string& subject, const LogSet& logs) const;
  void noteShown(const std::string& subject, const LogSet& logs);

  using Sets = std::vector<std::shared_ptr<const LogSet>>;
  using Shown = std::map<std::string, Sets>;
  const Shown& shown() const { return shown_; }

 private:
  /// Whether the whole without the parts of it that are shown or to be shown is empty or has enough
  /// devices.
  bool leavesEnough(const LogSet& whole, const Sets& shown, const LogSet& added) const;

  const LogTable& table_;
  const std::size_t devicesAtLeast_;
  Shown shown_;
  // Many subjects have the same sets.
  std::multimap<std::size_t, std::shared_ptr<const LogSet>> known_;
};

/// What answers about a statistic are about, as subjects of the ledger: all figures but means, and
/// means. They differ when logs of a distribution have no mean.
std::string subjectOf(KeyKind kind, const std::string& key);
std::string subjectOfMeans(KeyKind kind, const std::string& key);

/// One of the kind kOther is not shown by itself.
struct Group {
  PartName name;
  LogSet logs;
  std::size_t values = 1;  ///< how many values of the attribute it stands for
};

/// A set of logs and its parts.
struct Division {
  LogSet whole;
  bool isShown = false;  ///< when not, nothing of it may be shown
  std::vector<Group> groups;
  /// How many values were joined as the last group, of the kind kOther.
  std::size_t joined = 0;
};

/// Divides the union of the groups, which have no log in common, into parts that may be shown, and
/// notes these and the whole as shown. Groups of too few devices are joined, and with them as many
/// of the smallest others as it takes: what remains of the whole without the shown groups must have
/// enough devices, too. Empty groups are dropped; a whole that cannot be divided has no groups.
Division divide(Ledger& ledger, const std::string& subject, std::vector<Group> groups);

}  // namespace tavrel::fleet
