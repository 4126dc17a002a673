// Attributes of devices in sysfs.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"

namespace tavrel::health {

/// The text of an attribute without leading and trailing blanks; nothing when it is missing, cannot
/// be read or is empty. At most 4 KiB are read, and only of a regular file.
std::optional<std::string> readAttribute(const std::string& path);

/// The whole text as a decimal number, not negative; nothing for other text.
std::optional<std::int64_t> decimalOf(std::string_view text);
std::optional<std::int64_t> readNumber(const std::string& path);

/// An attribute as text for people and file formats: printable ASCII, at most 64 characters.
std::string readLabel(const std::string& path);

/// The same for an attribute that says whether a device is one of ours: an error when it cannot be
/// read although it is there, so that its device does not count as absent.
Expected<std::string> readKind(const std::string& path);

/// Names in a folder, in numeric order ("nvme2" before "nvme10"); none for a missing folder.
Expected<std::vector<std::string>> namesIn(const std::string& folder);

/// Whether `name` is `prefix` followed by digits only.
bool isNumbered(std::string_view name, std::string_view prefix);

/// `path` with links resolved; empty when there is no such file.
std::string resolved(const std::string& path);

/// Whether the device at `path`, or one above it, is suspended: reading would wake it.
bool isAsleep(const std::string& path);

}  // namespace tavrel::health
