// The uploader's settings: where to send logs, how long to wait, and who it is.
//
// The settings are in /etc/tavrel/upload.plist, out of reach of preferences and tasking. Secrets
// are credentials of the service manager: files in the folder that CREDENTIALS_DIRECTORY names.
#pragma once

#include <chrono>
#include <string>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"

namespace tavrel::upload {

struct Configuration {
  std::string url;   // the folder on the server, without a trailing slash
  std::string host;  // of the URL, in lower case, without the brackets of an IPv6 address
  bool mayBePlain = false;
  bool needsDefaultRoute = true;
  std::vector<std::string> meteredInterfaces;  // patterns of fnmatch(3)

  std::chrono::seconds connect{30};    // to the server, including the look-up of its name
  std::chrono::seconds stall{60};      // with almost no bytes in either direction
  std::chrono::seconds transfer{600};  // of one log, including the answer
  std::chrono::seconds run{3600};

  // Paths of PEM files; empty when there is none.
  std::string certificate;
  std::string key;
  std::string authority;  // trusted instead of the system's authorities
  std::string token;      // the text itself
};

inline constexpr const char* kConfigurationPath = "/etc/tavrel/upload.plist";

/// Reads the settings and, when `credentials` is not empty, the credentials in that folder. The
/// error is one line that says what to correct.
Expected<Configuration> readConfiguration(const DeviceRoot& root, FileSystem& files,
                                          PropertyListCoding& propertyLists,
                                          const std::string& credentials);

}  // namespace tavrel::upload
