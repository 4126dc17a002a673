#include "platform/linux/device/desktop_entries.h"

#include <algorithm>
#include <filesystem>
#include <string>
#include <string_view>
#include <system_error>
#include <unordered_set>
#include <vector>

#include "base/keyed_hash.h"
#include "base/limits.h"
#include "platform/linux/files/line_reader.h"

namespace tavrel {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kApplicationsFolder = "/applications";

struct DataFolder {
  std::string path;
  std::string_view bundleType;
};

// A user may replace a folder with a symbolic link, which may lead anywhere.
bool hasLink(std::string folder) {
  std::error_code ignored;
  for (const char* const name : {"/.local", "/share", "/applications"}) {
    folder += name;
    if (fs::is_symlink(folder, ignored)) return true;
  }
  return false;
}

std::vector<DataFolder> dataFolders(const DeviceRoot& root) {
  std::vector<DataFolder> folders;
  const auto addHome = [&](const std::string& home) {
    if (!hasLink(home)) folders.push_back({home + "/.local/share", PWUserApplicationType});
  };
  std::error_code error;
  for (fs::directory_iterator at(root.path("/home"), error), end; !error && at != end;
       at.increment(error)) {
    addHome(at->path().string());
  }
  std::sort(folders.begin(), folders.end(),
            [](const DataFolder& a, const DataFolder& b) { return a.path < b.path; });
  addHome(root.path("/root"));
  for (const auto path : {"/var/lib/flatpak/exports/share", "/usr/local/share"}) {
    folders.push_back({root.path(path), PWUserApplicationType});
  }
  folders.push_back({root.path("/usr/share"), kSystemApplicationType});
  return folders;
}

bool isApplication(const std::string& path) {
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
    if ((key == "NoDisplay" || key == "Hidden") && value == "true") return false;
  }
  return application && lines.errorNumber() == 0;
}

}  // namespace

void enumerateDesktopEntries(const DeviceRoot& root, SystemLog& log,
                             const std::function<void(const PWBundleProxy&)>& handler) {
  std::unordered_set<std::string, KeyedHash> seen;
  std::size_t visited = 0;
  for (const DataFolder& folder : dataFolders(root)) {
    const std::string top = folder.path + std::string(kApplicationsFolder);
    std::error_code error;
    fs::recursive_directory_iterator at(top, fs::directory_options::skip_permission_denied, error);
    for (; !error && at != fs::recursive_directory_iterator(); at.increment(error)) {
      const std::string path = at->path().string();
      if (++visited > limits::kDesktopFiles) {
        log.log(
            LogLevel::Error,
            "more than %zu files and folders among desktop entries; those from %s on do not count",
            limits::kDesktopFiles, path);
        return;
      }
      if (!path.ends_with(".desktop")) continue;
      std::string identifier = path.substr(top.size() + 1);
      std::replace(identifier.begin(), identifier.end(), '/', '-');
      if (seen.contains(identifier)) continue;
      if (seen.size() == limits::kDesktopEntries) {
        log.log(LogLevel::Error, "more than %zu desktop entries; those from %s on do not count",
                limits::kDesktopEntries, path);
        return;
      }
      seen.insert(identifier);
      if (isApplication(path)) handler({std::move(identifier), folder.bundleType});
    }
    if (error && error != std::errc::no_such_file_or_directory &&
        error != std::errc::not_a_directory) {
      log.log(LogLevel::Error, "cannot list the desktop entries in %s: %s", top, error.message());
    }
  }
}

}  // namespace tavrel
