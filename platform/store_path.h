// The location of the statistics store, for code that opens it and code that measures it.
#pragma once

#include <string_view>

namespace tavrel {

inline constexpr std::string_view kStorePath = "/var/mobile/Library/Brimhold/BHDataStore.sqlitedb";

}  // namespace tavrel
