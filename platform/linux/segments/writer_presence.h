// Whether a process can still write to a segment.
#pragma once

#include "platform/linux/segments/segment_file.h"

namespace tavrel {

enum class WriterPresence : unsigned char {
  Gone,     // for good: only the process that creates a segment opens it for writing
  Present,  // also when this process has it open for writing
  Unknown,  // keep the segment
};

/// Asks the kernel for a lease, which it refuses while any process has the file open or mapped for
/// writing. Needs the file's owner or CAP_LEASE, and a read-only descriptor. When leases do not
/// work, looks for the process that `facts` names.
WriterPresence findSegmentWriter(int readOnlyDescriptor, const SegmentFacts& facts);

/// Only looks for the process.
WriterPresence findSegmentProcess(const SegmentFacts& facts);

}  // namespace tavrel
