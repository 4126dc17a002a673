// Which figures count errors, so that views can mark those that are not 0.
#pragma once

#include <string_view>

namespace tavrel {

/// `key` is a key of the NAND information, with or without the common prefix, or a scalar of a log.
bool isErrorFigure(std::string_view key);

}  // namespace tavrel
