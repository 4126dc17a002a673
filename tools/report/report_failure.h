// Failures of the reporting facility, for people.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "ioreport/ioreport.h"

namespace tavrel {

inline constexpr std::string_view kLookAtDrivers =
    "'tavrelctl registry list' shows the drivers and the hub";

/// The reason that an error gives beyond its code.
std::optional<std::string> reasonOf(const std::optional<ErrorObject>& error);

/// "cannot WHAT: REASON (0xE00002F0): ADVICE", without the parts that are unknown.
std::string reportFailure(std::string_view what, const std::optional<ErrorObject>& error,
                          std::string_view advice = kLookAtDrivers);

}  // namespace tavrel
