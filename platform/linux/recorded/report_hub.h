// A connection to the recorded reporting hub, the service of class "IOReportHub".
//
//   method 0: opens the hub for this connection; other methods are refused until then
//   method 2: takes the channels of interest, makes a buffer for their elements and returns its ID
//   method 3: takes a buffer's ID and updates the elements in that buffer
//
// platform/report_protocol.h has the protocol.
//
// Channels of live services are read again for each update.
//
// The buffer holds one group of elements for each channel that the hub knows, in the order of
// interest; channels that it does not know, and live ones without a value, are left out. The first
// update shows the first group of each channel's sequence, the next one the second, and so on for
// each buffer on its own. Groups of one channel may differ in length, so the buffer has room for
// the longest. Groups that belong to no channel (driver 0, ID 2^63) fill the space after the last
// group, so a reader that steps from group to group always reaches the end. Before the first update
// the buffer is zero.
#pragma once

#include <memory>

#include "platform/linux/recorded/recording.h"
#include "platform/system_log.h"
#include "platform/user_client.h"

namespace tavrel {

/// `hub` is an entry of `recording`. The log must outlive the connection.
std::unique_ptr<UserClient> connectToReportHub(std::shared_ptr<const Recording> recording,
                                               const plist::Dictionary& hub, SystemLog& log);

}  // namespace tavrel
