// Records what one run has shown, and so decides what it must not show any more.
//
// A set of logs of fewer than K devices is never shown. Nor is a set from which such a small set
// could be derived by subtraction, given what was shown before about the same subject.
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/questions/log_set.h"

namespace tavrel::fleet {

inline constexpr std::size_t kDefaultDevicesAtLeast = 10;
/// With two devices, the owner of one could deduce the figures of the other.
inline constexpr std::size_t kFewestDevicesAtLeast = 3;

class Ledger {
 public:
  Ledger(const LogTable& table, std::size_t devicesAtLeast)
      : table_(table), devicesAtLeast_(devicesAtLeast) {}

  const LogTable& table() const { return table_; }
  std::size_t devicesAtLeast() const { return devicesAtLeast_; }
  bool hasEnough(const LogSet& logs) const { return logs.devices(table_) >= devicesAtLeast_; }

  /// True when all of this holds: the set has enough devices; it equals each shown set of the
  /// subject or differs from it by enough devices; and subtracting all shown parts, from it or from
  /// a shown set that includes it, leaves either nothing or enough devices.
  bool allows(const std::string& subject, const LogSet& logs) const;
  std::shared_ptr<const LogSet> noteShown(const std::string& subject, const LogSet& logs);

  using Sets = std::vector<std::shared_ptr<const LogSet>>;
  using Shown = std::map<std::string, Sets>;
  /// By subject. Tests check that no small set follows from these.
  const Shown& shown() const { return shown_; }

  /// Notes the parts of a whole as shown.
  void noteDivision(const std::string& subject, const LogSet& whole,
                    const std::vector<const LogSet*>& parts);
  /// The divisions of the whole that were noted.
  std::vector<Sets> divisionsOf(const std::string& subject, const LogSet& whole) const;

 private:
  /// Notes sets that share no log as shown.
  Sets noteDisjoint(const std::string& subject, const std::vector<const LogSet*>& disjoint);
  bool isNoneOrEnough(const LogSet& logs) const { return logs.empty() || hasEnough(logs); }

  const LogTable& table_;
  const std::size_t devicesAtLeast_;
  Shown shown_;
  /// What each shown set is without its shown parts; the set itself when it has none.
  Shown rests_;
  struct Parts {
    std::shared_ptr<const LogSet> whole;
    Sets parts;
  };
  std::map<std::string, std::vector<Parts>> divisions_;
  SharedLogSets sets_;
};

/// The ledger's subjects of an answer about a statistic: one for the means, one for all other
/// figures. They cover different logs when some logs of a distribution have no mean.
std::string subjectOf(KeyKind kind, const std::string& key);
std::string subjectOfMeans(KeyKind kind, const std::string& key);

}  // namespace tavrel::fleet
