// Which keys a log may have: those in its whitelist.
#pragma once

#include <map>
#include <string>
#include <string_view>
#include <unordered_set>

#include "base/expected.h"
#include "config/prefix_tree.h"
#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// Whitelists by their digests, with all groups of each.
class PermittedKeys {
 public:
  /// Reads a whitelist file.
  Status add(const std::string& path);
  bool empty() const { return whitelists_.empty(); }

  /// Why the log is refused: its whitelist was not added, or does not name one of its keys. Empty
  /// when the log is permitted. Safe to call in several threads.
  std::string faultOf(const LogRecord& record) const;

 private:
  struct Keys {
    std::unordered_set<std::string> keys;
    PrefixTree prefixes;
    bool permit(std::string_view key) const;
  };
  struct Whitelist {
    Keys scalars;
    Keys distributions;
  };
  std::map<std::string, Whitelist, std::less<>> whitelists_;
};

}  // namespace tavrel::fleet
