/* The layout of a segment: the file in which one process leaves its recorded values.
 *
 * A segment is a sparse file of kBHSegmentBytes in <root>/run/tavrel/stat/, a tmpfs, named
 * <anything>.segment. The process that records maps it; a reader uses pread. Numbers are in the
 * machine's byte order, since a segment never leaves the machine; every field is aligned to its
 * size, and times are seconds unless stated.
 *
 *   0            header
 *   kBHKeyTable  one 8-byte entry per key of the process
 *   kBHNames     the bytes of the keys' names
 *   kBHCells     cells of scalars, 64 bytes each
 *   kBHChunks    chunks of the record log, 4096 bytes each
 *
 * Times. A time is UTC seconds since 1970, or, with kBHUndated set, seconds since boot
 * (CLOCK_BOOTTIME): the clock showed a day before the library was built. A reader whose clock is
 * credible dates the latter: UTC = seconds + (CLOCK_REALTIME - CLOCK_BOOTTIME).
 *
 * Header. It is valid only once kBHHeaderMagic holds kBHSegmentMagic, which is stored last.
 *
 * Keys. An entry is name offset (bits 0-31, within the names), name length (32-47), kind (48-55).
 * It is stored atomically, after its name, and never changes; 0 means unused. The number of a key
 * in cells and records is its entry's index plus one.
 *
 * Cells. A cell holds one scalar of one day, or of one second since boot while undated. kBHCellKey
 * is stored last; 0 means unused. The current slot is kBHCellSlots[sets & 1]: adds go to it. A set
 * writes value and time into the other slot and then advances kBHCellSets, so the slot is valid if
 * the number of sets was the same before and after it was read. A reader remembers (sets, value) of
 * each cell. If the number of sets is the same, the difference of the values is an add; otherwise
 * the value is a set.
 *   A cell never goes back to zero. Once its day is over the process makes kBHCellCloses odd; a
 * reader that saw it odd *before* it read the value, and has folded that value durably, writes the
 * kBHCellCloses that it saw to kBHCellAcknowledged. Only then may the process give the cell another
 * kBHCellStart for the same key; differences from then on belong to that time. So nothing is lost
 * when a thread pauses between reading the clock and adding.
 *
 * Chunks. A chunk holds kBHChunkRecords records, in the order in which threads reserved them: value
 * (a double), then mark: key number (bits 0-15) and time (bits 16-62, bit 63 undated). The mark is
 * stored last; 0 means not written (yet). So a reader looks at marks first and reads the values in
 * a second pread. While a process may still write, only records before the first empty mark are
 * read; afterwards all. kBHChunkGeneration is 0 while unused and odd while the process empties the
 * chunk. A reader that has folded all records of a generation for good writes the generation to
 * kBHChunkAcknowledged, as the process itself does for a chunk that it left empty; only then does
 * the process use the chunk again, with a generation larger by two.
 *
 * A reader that has acknowledged all it can advances kBHHeaderFolds by one: space may be free.
 *
 * A kill can leave a missing magic (an empty segment), an unused key, cell or chunk, or a record
 * without a mark. Readers ignore each of these.
 *
 * Retiring. Nobody can write to a segment any more when no descriptor open for writing and no
 * shared mapping of it exists. The kernel knows exactly: on a descriptor opened for reading,
 * fcntl(F_SETLEASE, F_RDLCK) fails with EAGAIN while there is a writer, whatever its PID namespace
 * and whether or not the process closed its descriptors. (Set F_SETSIG to SIGURG first, and remove
 * the lease at once.) A process never opens an existing segment. A child made by fork unmaps the
 * segment at once; one made by another call does so at its first value or at exec. Where leases do
 * not work, the header names the process: PID namespace, PID and start time as in /proc/PID/stat;
 * it is gone when the reader is in the same namespace and no such process exists. (Processes that
 * /proc hides may still exist.)
 */
#ifndef BRIMHOLD_SEGMENT_FORMAT_H
#define BRIMHOLD_SEGMENT_FORMAT_H

#include <stdint.h>

#define kBHSegmentMagic UINT64_C(0x31544d4745534842) /* "BHSEGMT1" */
#define kBHUndated (UINT64_C(1) << 63)

enum {
  kBHSegmentVersion = 1,

  kBHSegmentBytes = 0x400000,
  kBHKeyTable = 0x1000,
  kBHKeyEntryBytes = 8,
  kBHKeys = 4096,
  kBHNames = 0x9000,
  kBHNamesBytes = 0x40000,
  kBHCells = 0x49000,
  kBHCellBytes = 64,
  kBHCellCount = 8192,
  kBHChunks = 0xc9000,
  kBHChunkBytes = 4096,
  kBHChunkCount = 823,
  kBHChunkRecords = 255,

  /* Header: offset, type. */
  kBHHeaderMagic = 0,         /* u64 */
  kBHHeaderVersion = 8,       /* u32 kBHSegmentVersion; other versions have other layouts */
  kBHHeaderPid = 12,          /* u32, in the process's own namespace */
  kBHHeaderBytes = 16,        /* u64 kBHSegmentBytes */
  kBHHeaderIdentity = 24,     /* 16 bytes that no two segments of an honest user share */
  kBHHeaderBoot = 40,         /* 16 bytes of /proc/sys/kernel/random/boot_id; 0 if unknown */
  kBHHeaderPidNamespace = 56, /* u64 inode of /proc/self/ns/pid; 0 if unknown */
  kBHHeaderStart = 64,        /* u64 start time in clock ticks since boot; 0 if unknown */
  kBHHeaderCellsUsed = 128,   /* u32, may exceed kBHCellCount */
  kBHHeaderChunksUsed = 132,  /* u32, may exceed kBHChunkCount */
  kBHHeaderDropped = 192,     /* u64 values dropped because the segment or its tmpfs was full */
  kBHHeaderFolds = 256,       /* u64, advanced by the reader */

  /* Cell. */
  kBHCellStart = 0,         /* u64 first second of the UTC day, or kBHUndated and a second */
  kBHCellSets = 8,          /* u64 */
  kBHCellSlots = 16,        /* two i64 values */
  kBHCellTimes = 32,        /* two u64: nanoseconds of the set, UTC, or kBHUndated and since boot */
  kBHCellKey = 48,          /* u32 */
  kBHCellCloses = 52,       /* u32 */
  kBHCellAcknowledged = 56, /* u32, written by the reader */

  /* Chunk. */
  kBHChunkReserved = 0,      /* u64 records begun; at least kBHChunkRecords once closed */
  kBHChunkGeneration = 8,    /* u32 */
  kBHChunkAcknowledged = 12, /* u32, written by the reader */
  kBHChunkFirst = 16,        /* records: f64 value, u64 mark */
  kBHRecordBytes = 16,

  /* Kinds of keys. */
  kBHKindScalar = 1,
  kBHKindDistribution = 2,

  /* Bytes of a name, which is UTF-8 without control characters. */
  kBHLongestName = 1024,

  kBHSecondsPerDay = 86400
};

#endif
