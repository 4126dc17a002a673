// Failures of the system as errors that a person can read.
#pragma once

#include <cerrno>
#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

/// "cannot WHAT PATH: WORDS", the words being the system's own for `code`.
Error systemError(std::string_view what, std::string_view path, int code = errno);

}  // namespace tavrel
