#include "tools/report/report_failure.h"

#include "base/format.h"
#include "tools/console/table.h"

namespace tavrel {

std::optional<std::string> reasonOf(const std::optional<ErrorObject>& error) {
  // The library gives a failure without a reason of its own the standard reason of its code.
  if (!error || error->failureReason == createCFErr(error->code, nullptr)->failureReason) {
    return std::nullopt;
  }
  return error->failureReason.value_or(error->description());
}

std::string reportFailure(std::string_view what, const std::optional<ErrorObject>& error,
                          std::string_view advice) {
  std::string line = "cannot " + std::string(what);
  if (const auto reason = reasonOf(error)) line += ": " + printable(*reason);
  if (error) line += format(" (%#x)", error->code);
  return line + ": " + std::string(advice);
}

}  // namespace tavrel
