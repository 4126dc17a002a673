// A device whose logs are sent, and the servers that receive them.
#pragma once

#include <sys/file.h>

#include "tests/devices/device_services.h"
#include "tests/devices/servers.h"
#include "upload/uploader.h"

namespace tavrel {

namespace fs = std::filesystem;
using upload::Outcome;

inline const std::string kSubmission = "/var/mobile/Library/Logs/Submission/";
inline const std::string kOutbox = kSubmission + "outbox/";

inline std::string status(const std::string& line, const std::string& headers = {}) {
  return "HTTP/1.1 " + line + "\r\n" + headers + "Content-Length: 0\r\n\r\n";
}
inline const std::string kOk = status("201 Created", "Tavrel-Received: DIGEST\r\n");

inline std::string nameOf(int number) {
  return format("log-tallied-20261127T18%02d%02dZ-5f0c9a1e", number / 60, number % 60);
}

struct Device : DeviceServices {
  Device() {
    permit("<true/>");
    // Uploads ignore all of these: nobody listens there.
    for (const char* variable : {"http_proxy", "https_proxy", "all_proxy"})
      setenv(variable, "http://127.0.0.1:1", 1);
    for (const char* variable : {"no_proxy", "NO_PROXY"})
      unsetenv(variable);
  }

  void permit(const std::string& value, const std::string& firstDay = {}) const {
    std::string entries = "<key>DiagnosticSubmissionEnabled</key>" + value;
    if (!firstDay.empty()) entries += "<key>DiagnosticSubmissionFirstDay</key>" + firstDay;
    write("/var/mobile/Library/Preferences/com.norvane.zentrix.plist",
          "<plist version=\"1.0\"><dict>" + entries + "</dict></plist>");
  }
  void configure(const std::string& settings) const {
    write(upload::kConfigurationPath,
          "<plist version=\"1.0\"><dict>" + settings + "</dict></plist>");
  }
  void add(const std::string& name, const std::string& place = "outbox/",
           std::string_view version = "Pellio 4.2 (16R349)") {
    const plist::Dictionary metadata{{"LogType", "193"},
                                     {"LogName", "log-tallied"},
                                     {"OSVersion", version},
                                     {"Time", clock.time},
                                     {"Options", plist::Dictionary{{"c", 7}, {"a&b", "x y"}}}};
    write(kSubmission + place + name + ".metadata.plist", *coding.encodeXml(metadata));
    write(kSubmission + place + name + ".log", "content of " + name);
  }
  Lines names(const std::string& place = "outbox") {
    return *files.list(root.path(kSubmission + place));
  }
  /// Takes the lock of a run, as another process would. A run must have taken place before.
  Descriptor lockRuns() const {
    Descriptor lock(open(root.path("/var/lib/tavrel/upload/lock").c_str(), O_RDWR | O_CLOEXEC));
    EXPECT_EQ(flock(lock.get(), LOCK_EX | LOCK_NB), 0);
    return lock;
  }
  UploadState state() { return readUploadState(files, coding, log, root.path(kUploadStateFile)); }
  Outcome run(bool atOnce = false, FileSystem* otherFiles = nullptr) {
    return upload::Uploader(
               {root, otherFiles ? *otherFiles : files, coding, preferences, clock, log},
               configuration)
        .run(atOnce);
  }
  Outcome runAgainst(const ScriptedServer& server, bool atOnce = false,
                     FileSystem* otherFiles = nullptr) {
    configuration.url = server.url();
    configuration.host = "127.0.0.1";
    configuration.mayBePlain = true;
    return run(atOnce, otherFiles);
  }
  void use(const std::string& url, const std::string& folder, const std::string& authority,
           const std::string& certificate) {
    configuration.url = url;
    configuration.host = "127.0.0.1";
    configuration.authority = folder + authority + ".crt";
    configuration.certificate = certificate.empty() ? "" : folder + certificate + ".crt";
    configuration.key = certificate.empty() ? "" : folder + certificate + ".key";
  }
  upload::Configuration configuration;
};

}  // namespace tavrel
