#include "platform/linux/device/desktop_entries.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <unordered_set>
#include <utility>
#include <vector>

#include "base/ascii.h"
#include "base/keyed_hash.h"
#include "base/limits.h"
#include "base/system_text.h"
#include "base/text.h"
#include "platform/linux/files/folder_walk.h"
#include "platform/linux/files/line_reader.h"

namespace tavrel {
namespace {

constexpr std::string_view kApplicationsFolder = "/applications";

struct DataFolder {
  std::string path;
  std::string_view bundleType;
};

// A user may replace a folder with a symbolic link, which may lead anywhere.
bool hasLink(std::string folder) {
  for (const char* const name : {"/.local", "/share", "/applications"}) {
    folder += name;
    struct stat status {};
    if (lstat(folder.c_str(), &status) == 0 && S_ISLNK(status.st_mode)) return true;
  }
  return false;
}

// The error number of a walk, without those of folders that are missing or that this user may not
// read: they have nothing to count.
int failureOf(int code) {
  return code == ENOENT || code == ENOTDIR || code == EACCES ? 0 : code;
}

void noteFailure(SystemLog& log, std::string_view what, const std::string& folder, int code) {
  if (code == 0) return;
  log.log(LogLevel::Error, "cannot list the %s in %s: %s; not all applications are counted", what,
          folder, systemText(code));
}

std::vector<DataFolder> dataFolders(const DeviceRoot& root, SystemLog& log) {
  std::vector<DataFolder> folders;
  const auto addHome = [&](const std::string& home) {
    if (!hasLink(home)) folders.push_back({home + "/.local/share", PWUserApplicationType});
  };
  const std::string homes = root.path("/home");
  const int code = walkFolder(homes, [&](const dirent& entry) {
    addHome(homes + '/' + entry.d_name);
    return true;
  });
  noteFailure(log, "homes", homes, failureOf(code));
  std::sort(folders.begin(), folders.end(),
            [](const DataFolder& a, const DataFolder& b) { return a.path < b.path; });
  addHome(root.path("/root"));
  for (const auto path : {"/var/lib/flatpak/exports/share", "/usr/local/share"}) {
    folders.push_back({root.path(path), PWUserApplicationType});
  }
  folders.push_back({root.path("/usr/share"), kSystemApplicationType});
  return folders;
}

// Whether a failed opening shows that the file is no entry, or none that this user may read.
bool isNoEntry(int code) {
  return code == ENOENT || code == ENOTDIR || code == ELOOP || code == EINVAL || code == EFBIG ||
         code == EACCES;
}

struct DesktopEntry {
  bool isApplication = false;
  int errorNumber = 0;
};

DesktopEntry readEntry(const std::string& path) {
  LineReader lines(path, limits::kDesktopEntryBytes);
  bool inEntry = false;
  bool application = false;
  while (const auto line = lines.next()) {
    if (line->starts_with('[')) {
      if (inEntry) break;
      inEntry = line->starts_with("[Desktop Entry]");
    }
    const std::size_t equals = line->find('=');
    if (!inEntry || line->starts_with('#') || equals == std::string_view::npos) continue;
    const std::string_view key = line->substr(0, line->find_last_not_of(" \t", equals - 1) + 1);
    const std::string_view value = trimmed(line->substr(equals + 1));
    if (key == "Type") application = value == "Application";
    if ((key == "NoDisplay" || key == "Hidden") && value == "true") return {};
  }
  return {application && lines.errorNumber() == 0, lines.errorNumber()};
}

bool isFolder(const std::string& path, const dirent& entry) {
  if (entry.d_type != DT_UNKNOWN) return entry.d_type == DT_DIR;
  struct stat status {};
  return lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

class Enumeration {
 public:
  Enumeration(SystemLog& log, const std::function<void(const PWBundleProxy&)>& handler)
      : log_(log), handler_(handler) {}

  bool isFull() const { return isFull_; }

  /// The error number of what ended it early.
  int visit(const std::string& folder, const std::string& prefix, std::string_view bundleType,
            int depth = 0) {
    int inner = 0;
    const int code = walkFolder(folder, [&](const dirent& entry) {
      const std::string path = folder + '/' + entry.d_name;
      if (++visited_ > limits::kDesktopFiles) {
        log_.log(
            LogLevel::Error,
            "more than %zu files and folders among desktop entries; those from %s on do not count",
            limits::kDesktopFiles, quotedText(path));
        isFull_ = true;
      } else if (path.ends_with(".desktop")) {
        take(path, prefix + entry.d_name, bundleType);
      }
      if (!isFull_ && isFolder(path, entry) && !isTooDeep(path, depth)) {
        inner = visit(path, prefix + entry.d_name + '-', bundleType, depth + 1);
      }
      return !isFull_ && inner == 0;
    });
    return inner != 0 ? inner : failureOf(code);
  }

 private:
  bool isTooDeep(const std::string& path, int depth) {
    if (depth < limits::kDesktopFolderDepth) return false;
    if (!std::exchange(isDepthTold_, true)) {
      log_.log(
          LogLevel::Error,
          "desktop entries nested more than %d folders deep do not count, as in %s; move them up",
          limits::kDesktopFolderDepth, quotedText(path));
    }
    return true;
  }

  void take(const std::string& path, std::string identifier, std::string_view bundleType) {
    const std::uint64_t hash = keyedHash(identifier);
    if (seen_.contains(hash)) return;
    if (seen_.size() == limits::kDesktopEntries) {
      log_.log(LogLevel::Error, "more than %zu desktop entries; those from %s on do not count",
               limits::kDesktopEntries, quotedText(path));
      isFull_ = true;
      return;
    }
    seen_.insert(hash);
    const DesktopEntry entry = readEntry(path);
    if (entry.isApplication) handler_({std::move(identifier), bundleType});
    if (entry.errorNumber != 0 && !isNoEntry(entry.errorNumber) &&
        !std::exchange(isUnreadTold_, true)) {
      log_.log(LogLevel::Error, "cannot read %s: %s; not all applications are counted",
               quotedText(path), systemText(entry.errorNumber));
    }
  }

  SystemLog& log_;
  const std::function<void(const PWBundleProxy&)>& handler_;
  std::unordered_set<std::uint64_t> seen_;  // hashes: the names may take 4 KB each
  std::size_t visited_ = 0;
  bool isFull_ = false;
  bool isDepthTold_ = false;
  bool isUnreadTold_ = false;
};

}  // namespace

void enumerateDesktopEntries(const DeviceRoot& root, SystemLog& log,
                             const std::function<void(const PWBundleProxy&)>& handler) {
  Enumeration enumeration(log, handler);
  for (const DataFolder& folder : dataFolders(root, log)) {
    const std::string top = folder.path + std::string(kApplicationsFolder);
    const int code = enumeration.visit(top, "", folder.bundleType);
    if (enumeration.isFull()) return;
    noteFailure(log, "desktop entries", top, code);
  }
}

}  // namespace tavrel
