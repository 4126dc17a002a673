// A log's metadata as headers of a request.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "base/plist.h"

namespace tavrel::upload {

/// Encodes '%', each byte of `also` and everything but printable ASCII as "%XX".
std::string percentEncoded(std::string_view text, std::string_view also = {});

/// One "Name: value" for each known entry of the metadata, which may be an empty handle.
std::vector<std::string> metadataHeaders(const plist::Dictionary& metadata);

}  // namespace tavrel::upload
