// Reads XML property lists in the form that devices nearly always write: ASCII, elements without
// attributes, no comments. It is several times as fast as a full XML reader, to which it leaves
// every other document (fleet/logs/expat_xml.h).
#pragma once

#include <cstdint>
#include <string_view>

#include "fleet/logs/log_builder.h"

namespace tavrel::fleet {

enum class PlainXml : std::uint8_t {
  Read,      // to its end, where the property list ends as well
  Refused,   // by the builder
  NotPlain,  // the document has another form, or is not a property list
};

PlainXml readPlainXml(std::string_view document, LogBuilder& builder);

}  // namespace tavrel::fleet
