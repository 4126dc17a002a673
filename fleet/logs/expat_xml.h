// Reads XML property lists in UTF-8 with Expat. Declares and expands no entity.
#pragma once

#include <memory>
#include <string>

#include "base/bytes.h"
#include "fleet/logs/log_builder.h"

struct XML_ParserStruct;

namespace tavrel::fleet {

/// One object reads one document after another.
class ExpatXml {
 public:
  /// Returns why the document is refused; empty when it was read.
  std::string read(ByteSpan document, LogBuilder& builder);

 private:
  struct Deleter {
    void operator()(XML_ParserStruct* parser) const;
  };
  std::unique_ptr<XML_ParserStruct, Deleter> parser_;
};

}  // namespace tavrel::fleet
