#include "platform/linux/files/property_list_file.h"

#include "base/limits.h"

namespace tavrel {

plist::Dictionary readDictionaryFile(FileSystem& files, PropertyListCoding& propertyLists,
                                     SystemLog& log, const std::string& path) {
  const auto bytes = files.readIfPresent(path, limits::kPropertyListBytes);
  if (!bytes) {
    log.write(LogLevel::Error, bytes.error().message);
    return {};
  }
  if (!*bytes) return {};
  const auto value = propertyLists.decode(asBytes(**bytes));
  if (value && value->dictionary()) return value->dictionary();
  const std::string reason = value ? "it is not a dictionary" : value.error().message;
  log.log(LogLevel::Error, "cannot read %s: %s; repair or remove it", path, reason);
  return {};
}

}  // namespace tavrel
