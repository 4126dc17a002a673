// The change between two samples of the same channels.
//
//   auto delta = IOReportCreateSamplesDelta(previous, current, &error);
//   IOReportIterate(delta, ...);
//
// A delta is read like a sample. Its values are the current ones minus the previous ones, in two's
// complement, so that counters may wrap; its timestamps, and values that cannot be subtracted, such
// as the extremes of a histogram's buckets, are those of the current sample. For a simple channel
// only the value is subtracted; its timestamp is that of the previous sample. A channel that the
// previous sample lacks keeps its values.
#pragma once

#include "base/plist.h"
#include "ioreport/error_object.h"

namespace tavrel {

/// An empty handle when a channel cannot be subtracted, and, without an error object, when the
/// aggregates do not have the same levels.
plist::Dictionary IOReportCreateSamplesDelta(const plist::Dictionary& previous,
                                             const plist::Dictionary& current, ErrorOut error);

/// The delta of two samples of a channel. Neither changes.
plist::Dictionary IOReportSampleCreateDelta(const plist::Dictionary& previous,
                                            const plist::Dictionary& current, ErrorOut error);

/// Writes the delta into the elements of `result`, which must have as many as `current`. On failure
/// they may be partly written.
KernelReturn computeDelta(const plist::Dictionary& previous, const plist::Dictionary& current,
                          const plist::Dictionary& result, ErrorOut error);

}  // namespace tavrel
