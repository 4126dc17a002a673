// The complete client of the kernel's reporting facility. Drivers publish channels: counters,
// arrays of them, histograms and times spent in states. Read the headers in this order:
//
//   error_object.h   how failures are reported
//   channel.h        one channel, and who and what it is
//   aggregate.h      a collection of channels
//   discovery.h      the channels that drivers publish
//   iteration.h      walking, pruning, merging, copying and pairing collections
//   selection.h      the channels of a category, format, unit or group
//   subscription.h   having the kernel keep the values of channels
//   samples.h        the values at one time
//   sample_values.h  reading them
//   delta.h          what changed between two samples
//   units.h          labels and scaling
//   description.h    channels and samples as text
//
// For instance, to read all simple channels once a day:
//
//   auto channels = IOReportCopyChannelsOfFormat(drivers, streams, kFormatSimple, 0, &error);
//   plist::Dictionary subscribed;
//   auto subscription = IOReportCreateSubscription(drivers, nullptr, channels, &subscribed, 0,
//                                                  &error);
//   auto samples = IOReportCreateSamples(subscription.get(), subscribed, &error);
//   IOReportIterate(samples, [&](const plist::Dictionary& channel) {
//     use(IOReportChannelGetChannelName(channel), IOReportSimpleGetIntegerValue(channel));
//     return kIterateContinue;
//   });
//
// The library keeps nothing between calls. Results belong to the caller, except those of operations
// with "Get" in their names, which are borrowed from the argument.
#pragma once

#include "ioreport/aggregate.h"         // IWYU pragma: export
#include "ioreport/channel.h"           // IWYU pragma: export
#include "ioreport/delta.h"             // IWYU pragma: export
#include "ioreport/description.h"       // IWYU pragma: export
#include "ioreport/discovery.h"         // IWYU pragma: export
#include "ioreport/error_object.h"      // IWYU pragma: export
#include "ioreport/histogram_values.h"  // IWYU pragma: export
#include "ioreport/iteration.h"         // IWYU pragma: export
#include "ioreport/sample_values.h"     // IWYU pragma: export
#include "ioreport/samples.h"           // IWYU pragma: export
#include "ioreport/selection.h"         // IWYU pragma: export
#include "ioreport/state_values.h"      // IWYU pragma: export
#include "ioreport/subscription.h"      // IWYU pragma: export
#include "ioreport/units.h"             // IWYU pragma: export
