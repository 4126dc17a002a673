// Which user may record which key.
//
// A property list reserves key prefixes for users: a dictionary from a user, by name or number, to
// an array of prefixes.
//
//  - Root records any key.
//  - Of the listed prefixes of a key, the longest decides: only its users may record the key, and
//    nobody but root while they do not exist.
//  - Anybody may record a key without a listed prefix, except listed users, who keep to theirs.
//  - Keys that begin with "com.norvane." are the system's: a user needs a listed prefix that begins
//    with it.
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

inline constexpr std::string_view kRecordersFile = "/etc/tavrel/recorders.plist";

class Recorders {
 public:
  /// With no user listed.
  Recorders() = default;

  /// Reads `kRecordersFile`. A file that is damaged, that users other than root and this user could
  /// have written, or that is a dangling link counts as absent, and so does an entry without an
  /// array of prefixes. Each of these, a file that cannot be read, and each user who does not exist
  /// or cannot be looked up is a line in the log.
  static Recorders read(const DeviceRoot& root, FileSystem& files,
                        PropertyListCoding& propertyLists, SystemLog& log);

  bool mayRecord(std::uint32_t user, std::string_view key) const;

  /// False when the file could not be read, or some user not be looked up, and `user` is not root:
  /// then `mayRecord` may err.
  bool areRightsKnown(std::uint32_t user) const { return user == 0 || areRightsKnown_; }

 private:
  void add(std::string_view user, const plist::Value& prefixes, const std::string& path,
           SystemLog& log);

  using Users = std::map<std::string, std::set<std::uint32_t>, std::less<>>;  // by prefix
  Users::const_iterator longestPrefixOf(std::string_view key) const;

  Users users_;
  std::set<std::uint32_t> listed_;
  bool areRightsKnown_ = true;
};

}  // namespace tavrel
