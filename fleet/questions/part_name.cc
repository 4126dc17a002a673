#include "fleet/questions/part_name.h"

namespace tavrel::fleet {

std::string PartName::text() const {
  switch (kind) {
    case PartKind::kWhole:
      return "(all)";
    case PartKind::kNotReported:
      return "(not reported)";
    case PartKind::kOther:
      return "(other)";
    case PartKind::kValue:
      break;
  }
  return value.starts_with('(') || value.starts_with('"') ? '"' + value + '"' : value;
}

}  // namespace tavrel::fleet
