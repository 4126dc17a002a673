#include "report/bh_report.h"
#include "report/rounding.h"

namespace tavrel {

std::int64_t BHReport::addScalar(std::int64_t value, std::string_view forKey,
                                 const plist::Dictionary& withOptions) {
  const std::int64_t stored = coarsened(value, withOptions);
  _scalarsOutput.set(forKey, stored);
  return stored;
}

void BHReport::addScalarForKey(std::string_view key,
                               const std::function<std::int64_t()>& byExecutingBlock) {
  if (const auto options = optionsForScalar(key)) addScalar(byExecutingBlock(), key, options);
}

}  // namespace tavrel
