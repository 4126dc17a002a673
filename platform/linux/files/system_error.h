// Failed system calls as readable errors.
#pragma once

#include <cerrno>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

/// "cannot WHAT PATH: WORDS", with the system's own text for `code`.
Error systemError(std::string_view what, std::string_view path, int code = errno);

}  // namespace tavrel
