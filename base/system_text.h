// Error numbers of the system as text.
#pragma once

#include <string>

namespace tavrel {

/// The system's words for an error number. Unlike std::strerror, any thread may call it.
std::string systemText(int code);

}  // namespace tavrel
