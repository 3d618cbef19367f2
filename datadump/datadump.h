#pragma once

#include <stdint.h>

#include "common/export.h"

// The data-dump flags: a record on the raw partition /dev/block/by-name/reserved which tells
// whether a dump of the user data partition is armed, and where its dump area begins. It outlives
// reboots and formatting of user data. The dump offset is an opaque number here: 0 when armed
// without one.
//
// The record is the 16 bytes at byte 300 of the partition, all fields little-endian: the first
// magic (32 bits, 0x00E215E2), the second magic (32 bits, 0x006B6B6B) and the dump offset (64
// bits). Any other magics mean disarmed.
//
// A failure to open, read or write the partition is one error in the system log, without a tag, and
// a result of -1; nothing is tried again, and what was written is not synchronised beyond the
// close. Any thread may call these, but nothing is locked: changes by two callers at once may mix.
extern "C" {

// Arms the dump with offset 0, whatever the record held. 0, or -1 if the record could not be read
// or written.
SENTROVA_API int datadump_enable();

// Disarms: fills the record with zeros, without reading it. 0, or -1 if that failed.
SENTROVA_API int datadump_disable();

// Sets the offset of an armed dump; 0 clears it and leaves the dump armed. 0, or -1 if the record
// could not be read or is not armed (then the old one stays) or could not be written (then it may
// be partly written).
SENTROVA_API int datadump_resize(uint64_t dump_offset);

// Returns 0 when disarmed, 1 when armed with offset 0, 2 when armed with another offset, or -1 when
// the record could not be read.
SENTROVA_API int datadump_get_status();

// Hands out the record as it stands, armed or not. 0, or -1 with the outputs untouched when it
// could not be read. No pointer may be null.
SENTROVA_API int datadump_query_flags(uint32_t* first_magic, uint32_t* second_magic,
                                      uint64_t* dump_offset);

}  // extern "C"
