#include "fleet/questions/part_name.h"

namespace tavrel::fleet {

std::string PartName::text() const {
  switch (kind) {
    case PartKind::Whole:
      return "(all)";
    case PartKind::NotReported:
      return "(not reported)";
    case PartKind::Other:
      return "(other)";
    case PartKind::Value:
      break;
  }
  return value.starts_with('(') || value.starts_with('"') ? '"' + value + '"' : value;
}

}  // namespace tavrel::fleet
