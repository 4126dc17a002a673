// Names the parts of a set of logs so that no text in a log can be mistaken for a name of ours.
#pragma once

#include <cstdint>
#include <string>

namespace tavrel::fleet {

enum class PartKind : std::uint8_t {
  Whole,
  Value,        // the logs with one value of an attribute
  NotReported,  // the logs without the attribute
  Other,        // logs with several values, none of which may be shown by itself
};

struct PartName {
  PartKind kind = PartKind::Whole;
  std::string value = {};  // empty unless the kind is `Value`

  bool isValue() const { return kind == PartKind::Value; }
  /// For people: "(all)", "(not reported)", "(other)", or the value, in quotation marks when it
  /// begins with a parenthesis or a quotation mark.
  std::string text() const;
};

}  // namespace tavrel::fleet
