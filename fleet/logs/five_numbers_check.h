// Checks that the five numbers of a distribution are possible.
#pragma once

#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// Why no series of values has these five numbers; null when one can have them.
///
/// Values may be infinite or not-a-number; then mean and deviations are not finite either. Minimum
/// and maximum are not-a-number when the first value was. Such a distribution is valid, but cannot
/// be merged with others exactly.
const char* faultOf(const FiveNumbers& numbers);

}  // namespace tavrel::fleet
