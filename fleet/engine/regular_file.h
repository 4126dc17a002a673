// The files beside the tables: a database's header, a password.
#pragma once

#include <cstddef>
#include <optional>
#include <string>

namespace tavrel::fleet {

/// The first bytes of a regular file, at most `most`; nothing when there is no such file. Does not
/// wait for a writer, as reading a pipe would. Throws EngineError.
std::optional<std::string> readBeginning(const std::string& path, std::size_t most);

}  // namespace tavrel::fleet
