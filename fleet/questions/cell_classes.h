// The histogram cells of many logs, coarsened until each counts values of enough devices.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <utility>
#include <vector>

#include "fleet/questions/histogram.h"
#include "fleet/questions/log_set.h"

namespace tavrel::fleet {

/// Collects the cells of one key in one set of logs.
///
/// Cells overlap in part where whitelists drew different boundaries; they are then divided into
/// classes within which no cells overlap. Within a class, neighbouring cells of too few devices
/// are joined. Of classes that have too few devices as a whole, only the number of values is
/// kept, as one cell over all numbers; when that too has too few devices, the cell with the
/// fewest values joins it. So each resulting cell is of enough devices, and so is every number of
/// values that can be computed from the cells. The ends of a joined cell are those of the outermost
/// cells in it, which may be of few devices.
class CellClasses {
 public:
  explicit CellClasses(const LogTable& table) : table_(table) {}

  /// Ignores a cell without values, or whose ends do not form an interval.
  void add(LogIndex log, const Cell& cell);

  struct Coarsened {
    std::vector<Cell> cells;  // none when all of them together have too few devices
    bool isJoined = false;    // whether some were joined
  };
  Coarsened coarsened(std::size_t devicesAtLeast) const;

 private:
  using Ends = std::pair<double, double>;
  struct Counted {
    std::uint64_t count = 0;
    std::vector<LogIndex> logs;
  };
  using Class = std::map<Ends, const Counted*>;

  std::vector<Class> classes(std::vector<const Counted*>& rest) const;
  void joinSmall(const Class& all, std::size_t devicesAtLeast, DeviceCounter& counter,
                 Coarsened& result) const;

  const LogTable& table_;
  std::map<Ends, Counted> cells_;
};

}  // namespace tavrel::fleet
