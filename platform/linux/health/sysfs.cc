#include "platform/linux/health/sysfs.h"

#include <algorithm>
#include <array>
#include <climits>
#include <cstdlib>
#include <fcntl.h>
#include <sys/stat.h>

#include "base/ascii.h"
#include "base/parse_number.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"

namespace tavrel::health {
namespace {

constexpr std::size_t kLabelBytes = 64;

// Empty for an attribute that is missing, or whose device has gone.
Expected<std::string> textOf(const std::string& path) {
  const auto failed = [&]() -> Expected<std::string> {
    const bool isGone = errno == ENOENT || errno == ENOTDIR || errno == ENODEV || errno == ENXIO;
    if (isGone) return std::string();
    return systemError("read", path);
  };
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  struct stat status {};
  if (!file || fstat(file.get(), &status) != 0) return failed();
  if (!S_ISREG(status.st_mode)) return std::string();
  std::array<char, 4096> buffer{};
  const ssize_t size = read(file.get(), buffer.data(), buffer.size());
  if (size < 0) return failed();
  return std::string(trimmed(std::string_view(buffer.data(), static_cast<std::size_t>(size))));
}

}  // namespace

std::optional<std::string> readAttribute(const std::string& path) {
  auto text = textOf(path);
  if (!text || text->empty()) return std::nullopt;
  return *std::move(text);
}

std::optional<std::int64_t> decimalOf(std::string_view text) {
  const auto value = parseNumber<std::int64_t>(text);
  return value && *value >= 0 ? value : std::nullopt;
}

std::optional<std::int64_t> readNumber(const std::string& path) {
  const auto text = readAttribute(path);
  return text ? decimalOf(*text) : std::nullopt;
}

std::string readLabel(const std::string& path) {
  auto label = readKind(path);
  return label ? *std::move(label) : std::string();
}

Expected<std::string> readKind(const std::string& path) {
  auto label = textOf(path);
  if (!label) return label;
  label->resize(std::min(label->size(), kLabelBytes));
  std::ranges::replace_if(
      *label, [](char c) { return c < ' ' || c > '~'; }, '?');
  return label;
}

Expected<std::vector<std::string>> namesIn(const std::string& folder) {
  auto names = FileSystem().list(folder);
  if (!names) return names.error();
  std::ranges::stable_sort(*names, {}, &std::string::size);
  return names;
}

bool isNumbered(std::string_view name, std::string_view prefix) {
  if (!name.starts_with(prefix) || name.size() == prefix.size()) return false;
  return name.find_first_not_of("0123456789", prefix.size()) == std::string_view::npos;
}

std::string resolved(const std::string& path) {
  // If realpath allocated the room, a lack of memory would look like a missing file.
  std::array<char, PATH_MAX> real{};
  return realpath(path.c_str(), real.data()) != nullptr ? std::string(real.data()) : std::string();
}

bool isAsleep(const std::string& path) {
  std::string folder = resolved(path);
  while (!folder.empty() && !folder.ends_with("/devices")) {
    const auto status = readAttribute(folder + "/power/runtime_status");
    if (status && (*status == "suspended" || *status == "suspending")) return true;
    folder.resize(folder.find_last_of('/'));
  }
  return false;
}

}  // namespace tavrel::health
