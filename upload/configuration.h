// What an uploader is told: where to send logs, with what patience, and who it is.
//
// The settings are in /etc/tavrel/upload.plist, which no preference and no tasking reaches. Secrets
// are credentials of the service manager: files in the folder that CREDENTIALS_DIRECTORY names.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"

namespace tavrel::upload {

struct Configuration {
  std::string url;   // of the folder on the server, without a slash at its end
  std::string host;  // in it, lower case, without the brackets of an IPv6 address
  bool mayBePlain = false;
  bool needsDefaultRoute = true;
  std::vector<std::string> meteredInterfaces;  // names, in the form of fnmatch(3)

  std::chrono::seconds connect{30};    // to the server, the look-up of its name included
  std::chrono::seconds stall{60};      // with hardly a byte in either direction
  std::chrono::seconds transfer{600};  // of one log, with its answer
  std::chrono::seconds run{3600};

  // Paths of files in PEM form; empty when there is none.
  std::string certificate;
  std::string key;
  std::string authority;  // trusted in place of the system's
  std::string token;      // the text itself
};

inline constexpr const char* kConfigurationPath = "/etc/tavrel/upload.plist";

/// Reads the settings, and the credentials in the folder `credentials` when it is not empty. The
/// error is one line that says what to mend.
Expected<Configuration> readConfiguration(const DeviceRoot& root, FileSystem& files,
                                          PropertyListCoding& propertyLists,
                                          const std::string& credentials);

}  // namespace tavrel::upload
