// The libraries that the program may load while it runs.
//
// The platform offers them itself: a table answers each path with functions bound to its services.
// Whatever is not in the table does not load.
//
//   /System/Library/PrivateFrameworks/FaultlineSupport.framework/FaultlineSupport
//     ZTXPreferencesGetIntegerValue   IntegerPreferenceGetter
//     ZTXPreferencesSetValue          PreferenceSetter
//
// /etc/tavrel/dynamic-libraries.plist under the device root takes from it, so that what depends on
// a library can be seen without it: under the path of a library, false when it does not load, or
// an array of names of functions that it lacks. The file is read at each load.
#pragma once

#include "platform/dynamic_loading.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/preferences.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

class LinuxDynamicLoader final : public DynamicLoader {
 public:
  /// Functions that were found use `preferences` for as long as they live.
  LinuxDynamicLoader(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                     SystemLog& log, Preferences& preferences)
      : root_(root),
        files_(files),
        propertyLists_(propertyLists),
        log_(log),
        preferences_(preferences) {}

  std::unique_ptr<DynamicLibrary> load(std::string_view path) override;

 private:
  const DeviceRoot& root_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
  Preferences& preferences_;
};

}  // namespace tavrel
