// Random bytes, for names and identifiers that must not collide.
#pragma once

#include <string>

#include "base/bytes.h"

namespace tavrel {

void fillRandom(MutableByteSpan bytes);

/// Eight random bytes as 16 hexadecimal digits.
std::string randomName();

/// The text of a new random UUID (version 4).
std::string randomUuidText();

}  // namespace tavrel
