// The libraries that the program may load at run time.
//
// The platform itself provides them: a table maps each path to functions bound to its services.
// Other libraries do not load.
//
//   /System/Library/PrivateFrameworks/FaultlineSupport.framework/FaultlineSupport
//     ZTXPreferencesGetIntegerValue   IntegerPreferenceGetter
//     ZTXPreferencesSetValue          PreferenceSetter
//
// /etc/tavrel/dynamic-libraries.plist under the device root can take libraries away, to show how
// the system behaves without them. Its keys are library paths; a value is false for a library that
// does not load, or an array of the functions that it lacks. The file is read at each load.
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
  /// Functions use `preferences`, which must outlive them.
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
