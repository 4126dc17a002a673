#include "fleet/sources/file_name.h"

#include <algorithm>
#include <array>

#include "platform/tallied_log.h"

namespace tavrel::fleet {
namespace {

constexpr std::string_view kGzipEnding = ".gz";
constexpr std::array<std::string_view, 11> kArchiveEndings = {
    ".tar", ".tar.gz",  ".tgz",  ".tar.bz2", ".tbz2",  ".tar.xz",
    ".txz", ".tar.zst", ".tzst", ".tar.lz4", ".tar.lz"};

}  // namespace

bool isArchiveName(std::string_view name) {
  return std::ranges::any_of(kArchiveEndings,
                             [&](std::string_view ending) { return name.ends_with(ending); });
}

bool isMetadataName(std::string_view name) {
  return name.ends_with(kLogMetadataEnding);
}

bool isLogName(std::string_view name) {
  if (name.starts_with('.') || isMetadataName(name)) return false;
  name = withoutGzip(name);
  return name.ends_with(kLogEnding) || name.ends_with(".plist");
}

std::string_view withoutGzip(std::string_view name) {
  if (name.ends_with(kGzipEnding)) name.remove_suffix(kGzipEnding.size());
  return name;
}

std::string sidecarOf(std::string_view logPath) {
  const std::string_view path = withoutGzip(logPath);
  const std::string_view name = fileNameOf(path);
  const std::size_t dot = std::min(name.rfind('.'), name.size());
  return std::string(path.substr(0, path.size() - name.size() + dot)).append(kLogMetadataEnding);
}

std::string_view fileNameOf(std::string_view path) {
  return path.substr(path.rfind('/') + 1);
}

std::string_view folderNameOf(std::string_view path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string_view::npos ? std::string_view() : fileNameOf(path.substr(0, slash));
}

}  // namespace tavrel::fleet
