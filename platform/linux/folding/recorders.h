// Which user may record which key.
//
// A property list gives users prefixes of their own: a dictionary from a user, by name or number,
// to an array of prefixes.
//
//  - Root records any key.
//  - Of the prefixes with which a key begins, the longest decides: only its users record the key.
//  - A key without a prefix is free, except for users that are listed, who keep to their prefixes.
//  - Keys that begin with "com.norvane." are the system's: a user needs a prefix that begins so.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <set>
#include <string>
#include <string_view>

#include "base/plist.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

class Recorders {
 public:
  /// Nobody is listed.
  Recorders() = default;

  /// What /etc/tavrel/recorders.plist says. A file that is damaged, that users other than root and
  /// this user could have written, or that is a link that leads nowhere, counts as absent, with a
  /// line in the log; so does each entry that is not understood.
  static Recorders read(const DeviceRoot& root, FileSystem& files,
                        PropertyListCoding& propertyLists, SystemLog& log);

  bool mayRecord(std::uint32_t user, std::string_view key) const;

 private:
  void add(std::string_view user, const plist::Value& prefixes, const std::string& path,
           SystemLog& log);

  using Users = std::map<std::string, std::set<std::uint32_t>, std::less<>>;  // by prefix
  Users::const_iterator longestPrefixOf(std::string_view key) const;

  Users users_;
  std::set<std::uint32_t> listed_;
};

}  // namespace tavrel
