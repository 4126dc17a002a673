// Whether a process can still write to a segment.
#pragma once

#include "platform/linux/segments/segment_file.h"

namespace tavrel {

enum class SegmentWriter : unsigned char {
  Gone,     // and none can come: a segment is only opened to write by whoever makes it
  Present,  // or a descriptor of this process is open to write
  Unknown,  // leave the segment
};

/// Asks the kernel for a lease, which it refuses while anybody has the file open or mapped to
/// write; needs the file's owner or CAP_LEASE, and a descriptor that can only be read. Where there
/// are no leases the process that `facts` names is looked for.
SegmentWriter findSegmentWriter(int readOnlyDescriptor, const SegmentFacts& facts);

/// The second way alone.
SegmentWriter findSegmentProcess(const SegmentFacts& facts);

}  // namespace tavrel
