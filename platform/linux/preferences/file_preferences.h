// Preferences as property lists, one file per domain:
// /var/mobile/Library/Preferences/<domain>.plist.
//
// A domain is read on first use. Values that this process sets are visible to it at once, but stay
// a separate list of changes until the domain is synchronised. The changes are then applied, under
// a lock that all writers share, to the current content of the file, so keys that others have
// written in the meantime survive. A domain without changes costs no write. The destructor
// synchronises all changed domains.
//
// A change that no property list can hold, that needs more than 1 MiB or that no longer fits into
// the file is dropped with a log line, so that the domain's other changes are written.
//
// A file that is not a property list is reported once, reads as empty, and is set aside as
// "<domain>.plist.corrupt-<stamp>-<unique>" when the domain is next written.
#pragma once

#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "base/plist.h"
#include "platform/clock.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/preferences.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

inline constexpr std::string_view kPreferencesFolder = "/var/mobile/Library/Preferences";

class FilePreferences final : public Preferences {
 public:
  FilePreferences(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                  Clock& clock, SystemLog& log);
  ~FilePreferences() override;

  plist::Value ZTXPreferencesGetValue(std::string_view key, std::string_view domain) override;
  void ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                              std::string_view domain) override;
  bool ZTXPreferencesSynchronize(std::string_view domain) override;

  /// The domains that have a file, sorted.
  Expected<std::vector<std::string>> domains();
  /// All keys of a domain as this process sees them; the caller's own.
  plist::Dictionary values(std::string_view domain);

  /// A domain as its file has it at this moment, without this process's changes; an empty handle
  /// when there is no file. Unlike look-ups, this fails when the file cannot be read.
  Expected<plist::Dictionary> storedValues(std::string_view domain);

  /// Whether a damaged file of this domain was set aside and is still there.
  Expected<bool> hasDamagedFile(std::string_view domain);

  /// Whether `domain` can name a file: not empty, at most `limits::kPreferenceDomainBytes` bytes,
  /// without slashes and control characters, not beginning with a dot.
  static bool isValidDomain(std::string_view domain);

 private:
  struct Domain {
    std::optional<plist::Dictionary> stored;  // the file's content, once it has been read
    std::map<std::string, plist::Value, std::less<>> changes;  // null removes the key
    bool unreadableReported = false;
    bool unwritableReported = false;
  };
  /// The content of a domain's file at one moment.
  struct Content {
    std::string bytes;         // empty when there is no file
    plist::Dictionary values;  // may be an empty handle
    std::string fault;         // why the bytes are no preferences; empty when they are
  };

  Domain& domainNamed(std::string_view domain);
  std::string pathOf(std::string_view domain) const;
  Expected<Content> readContent(const std::string& path);
  const plist::Dictionary& storedOf(Domain& domain, std::string_view name);
  bool synchronize(Domain& domain, std::string_view name);
  Status writeChanges(Domain& domain, std::string_view name);
  /// `merged`, which is `stored` with the domain's changes, as XML. Changes that no file can hold
  /// or that do not fit into this one are dropped from both, with a log line each.
  Expected<std::string> encodeWhatFits(Domain& domain, const plist::Dictionary& stored,
                                       plist::Dictionary& merged, std::string_view name);
  Status setAside(const std::string& path, std::string_view fault);

  std::string folder_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  Clock& clock_;
  SystemLog& log_;
  std::map<std::string, Domain, std::less<>> domains_;
};

}  // namespace tavrel
