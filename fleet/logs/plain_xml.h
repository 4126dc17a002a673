// A reader of XML property lists in the form in which devices write nearly all of them: ASCII,
// elements without attributes, no comments. It is several times as fast as a reader of all of XML,
// and leaves every other document to that one (fleet/logs/expat_xml.h).
#pragma once

#include <cstdint>
#include <string_view>

#include "fleet/logs/log_builder.h"

namespace tavrel::fleet {

enum class PlainXml : std::uint8_t {
  kRead,      ///< to its end, which is that of a property list
  kRefused,   ///< by the builder
  kNotPlain,  ///< the document has another form, or is no property list
};

PlainXml readPlainXml(std::string_view document, LogBuilder& builder);

}  // namespace tavrel::fleet
