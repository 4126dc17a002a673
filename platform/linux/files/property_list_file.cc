#include "platform/linux/files/property_list_file.h"

#include <cerrno>
#include <unistd.h>

#include "base/limits.h"
#include "base/system_text.h"

namespace tavrel {

plist::Dictionary readDictionaryFile(FileSystem& files, PropertyListCoding& propertyLists,
                                     SystemLog& log, const std::string& path) {
  const auto bytes = files.readIfPresent(path, limits::kPropertyListBytes);
  if (!bytes) {
    log.write(LogLevel::Error, bytes.error().message);
    return {};
  }
  return *bytes ? dictionaryIn(**bytes, propertyLists, log, path) : plist::Dictionary();
}

plist::Dictionary dictionaryIn(std::string_view bytes, PropertyListCoding& propertyLists,
                               SystemLog& log, const std::string& path) {
  const auto value = propertyLists.decode(asBytes(bytes));
  if (value && value->dictionary()) return value->dictionary();
  const std::string reason = value ? "it is not a dictionary" : value.error().message;
  log.log(LogLevel::Error, "cannot read %s: %s; repair or remove it", path, reason);
  return {};
}

std::string reasonToMiss(const std::string& path) {
  struct stat link {};
  const std::string folder = path.substr(0, path.rfind('/'));
  const auto found = FileSystem::status(folder);
  if (lstat(folder.c_str(), &link) == 0 && !(found && S_ISDIR(found->st_mode))) {
    return "its folder is a link that leads nowhere, or a file";
  }
  return lstat(path.c_str(), &link) == 0 ? "it is a link that leads nowhere" : "";
}

std::string reasonToDistrust(const std::string& path) {
  const auto status = FileSystem::status(path);
  return status ? reasonToDistrust(*status) : "its owner is unknown: " + systemText(errno);
}

std::string reasonToDistrust(const struct stat& status) {
  if ((status.st_uid == 0 || status.st_uid == geteuid()) &&
      (status.st_mode & (S_IWGRP | S_IWOTH)) == 0) {
    return {};
  }
  return "users other than root may write it: make root its owner and set mode 0644";
}

}  // namespace tavrel
