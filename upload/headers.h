// A log's metadata as headers of a request.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "base/plist.h"

namespace tavrel::upload {

/// Printable ASCII as it is, but "%XX" for '%', for each byte of `also` and for each other byte.
std::string percentEncoded(std::string_view text, std::string_view also = {});

/// "Name: value" each, for what the metadata has. The dictionary may be an empty handle.
std::vector<std::string> metadataHeaders(const plist::Dictionary& metadata);

}  // namespace tavrel::upload
