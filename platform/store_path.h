// Where the statistics store stands, for those who open it and those who measure it.
#pragma once

#include <string_view>

namespace tavrel {

inline constexpr std::string_view kStorePath = "/var/mobile/Library/Brimhold/BHDataStore.sqlitedb";

}  // namespace tavrel
