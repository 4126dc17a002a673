#include "base/format.h"
namespace tavrel { Status appendForeignFormat(std::string&, std::string_view, std::span<const FormatArgument>) { return Done{}; } void format_detail::appendChecked(std::string&, std::string_view, std::span<const FormatArgument>) {} }
