// What the five numbers of a distribution can be.
#pragma once

#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// Why no series of values has these five numbers; null when one can have them.
///
/// Values may be infinite or not a number, and then so are mean and deviations; minimum and maximum
/// are not a number when the first value was not. Such a distribution is good, but cannot be merged
/// with others exactly.
const char* faultOf(const FiveNumbers& numbers);

}  // namespace tavrel::fleet
