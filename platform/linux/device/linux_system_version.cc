#include "platform/linux/device/linux_system_version.h"

#include <sys/utsname.h>

#include "base/ascii.h"
#include "base/limits.h"
#include "platform/linux/files/property_list_file.h"
#include "platform/submission.h"

namespace tavrel {
namespace {

constexpr std::string_view kVersionFile = "/etc/tavrel/system-version.plist";
constexpr std::string_view kOsReleaseFiles[] = {"/etc/os-release", "/usr/lib/os-release"};

/// A value as the shell would read it.
std::string unquoted(std::string_view text) {
  std::string value;
  char quote = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (quote == 0 && (c == '"' || c == '\'')) {
      quote = c;
    } else if (c == quote && quote != 0) {
      quote = 0;
    } else if (c == '\\' && quote != '\'' && i + 1 < text.size()) {
      value += text[++i];
    } else {
      value += c;
    }
  }
  return value;
}

/// Callers expect every entry to be a string.
plist::Dictionary stringsOf(const plist::Dictionary& dictionary) {
  auto strings = plist::Dictionary::create(dictionary.size());
  for (const auto& [key, value] : dictionary) {
    if (value.kind() == plist::Kind::String) strings.set(key, value);
  }
  return strings;
}

}  // namespace

std::optional<std::string> osReleaseValue(std::string_view text, std::string_view name) {
  std::optional<std::string> value;
  while (!text.empty()) {
    const std::string_view line = trimmed(takeLine(text));
    if (line.starts_with(name) && line.size() > name.size() && line[name.size()] == '=') {
      value = unquoted(line.substr(name.size() + 1));
    }
  }
  return value;
}

plist::Dictionary LinuxSystemVersion::systemVersionDictionary() {
  return plist::mutableCopy(known());
}

std::string LinuxSystemVersion::text() {
  const auto version = known();
  std::string text(version.string(kProductNameKey).value_or(""));
  if (const auto number = version.string(kProductVersionKey)) {
    if (!text.empty()) text += ' ';
    text += *number;
  }
  if (const auto build = version.string(kProductBuildVersionKey)) {
    if (!text.empty()) text += ' ';
    text += '(';
    text += *build;
    text += ')';
  }
  return text.empty() ? std::string(kUnknownOSVersion) : text;
}

const plist::Dictionary& LinuxSystemVersion::known() {
  if (known_) return known_;
  const std::string path = root_.path(kVersionFile);
  // A file that exists but cannot be read leaves the version unknown: another source, or none,
  // would look like an update of the OS.
  const auto content = files_.readIfPresent(path, limits::kPropertyListBytes);
  const bool isMissing = content && !*content;
  known_ = isMissing ? fromOsRelease()
                     : stringsOf(readDictionaryFile(files_, propertyLists_, log_, path));
  return known_;
}

plist::Dictionary LinuxSystemVersion::fromOsRelease() {
  std::optional<std::string> text;
  for (const bool below : {true, false}) {
    for (const std::string_view file : kOsReleaseFiles) {
      const std::string path = below ? root_.path(file) : std::string(file);
      auto content = files_.readIfPresent(path, limits::kSystemFactBytes);
      if (!content) {
        log_.write(LogLevel::Error, content.error().message);
        return plist::Dictionary::create();
      }
      if (*content) {
        text = *std::move(*content);
        break;
      }
    }
    if (text) break;
  }

  auto version = plist::Dictionary::create();
  const std::string_view release = text ? std::string_view(*text) : std::string_view();
  if (const auto name = osReleaseValue(release, "NAME")) version.set(kProductNameKey, *name);
  const auto number = osReleaseValue(release, "VERSION_ID");
  if (number) version.set(kProductVersionKey, *number);

  // On a system without build IDs, each kernel release counts as a build.
  auto build = osReleaseValue(release, "BUILD_ID");
  utsname kernel{};
  if (!build && uname(&kernel) == 0) {
    build = number ? *number + "-" + kernel.release : std::string(kernel.release);
  }
  if (build) version.set(kProductBuildVersionKey, *build);
  return version;
}

}  // namespace tavrel
