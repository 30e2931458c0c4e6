// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_SNAPSHOT_H
#define KSP_SNAPSHOT_H

/*
 * Text reports of the controller's timed snapshots. Neither renderer allocates or keeps state, and both may
 * run on several threads at once; the C library, when a page asks it for the local time, may read the time
 * zone.
 */

#include <stdint.h>

#include "ksp/api.h"

KSP_BEGIN_DECLARATIONS

/**
 * Renders fixed-layout snapshot records as a text report: a legend, a line a record, an empty line.
 *
 * `records` holds `length` bytes, 252 per record; a shorter tail is ignored. It may be null if `length` is 0,
 * and any bytes are safe. `*size` is the capacity of `out` in bytes on entry, and the text's length without
 * its NUL on success.
 * Returns 1 when the whole report fits, its NUL included. Else returns 0, `*size` unchanged and `out` full of
 * the report's beginning, cut and NUL-terminated at its last byte; an `out` of 0 bytes may be null.
 */
KSP_API int KSPParseSnapshotBuffer(const void* records, uint64_t length, char* out, uint64_t* size);

/**
 * Renders one page of a snapshot whose record layout a header describes.
 *
 * `header` may be null; otherwise the caller must have fetched it whole: its 36 fixed bytes, from version 6
 * on the NUL-terminated title behind them, and the descriptor table at the header's own table offset, 8 bytes
 * and 28 for each of the descriptors that it counts. What stands within that extent may be hostile: a field
 * that does not lie within a record, or whose format asks for other values than the field has, is not
 * printed. `records` holds `length` bytes and may be null if that is 0; any bytes are safe. A record that
 * does not lie wholly within them ends the snapshot, whatever the header counts.
 *
 * `*size` is the capacity of `out` in bytes on entry and the page's length with its NUL on return; an `out`
 * of 0 bytes may be null. `*cursor` is the record to go on with: 0 before the first page, and for each next
 * page what the call left there.
 *
 * A page begins with the local time of its rendering and, the first, with a legend or title; it then has a
 * line for each record that is in use, whole lines only. Its text is empty, and `*size` 1, when it has no
 * such line. The record in the last slot that the header counts is never rendered.
 *
 * Returns 1 when no record is left, and 0 when the page was too small or, with everything untouched, when
 * `header` is null. A page too small for its time or heading leaves the cursor as it was. Otherwise the
 * record whose line did not fit is the one before the cursor, and later calls pass it over: to have it on the
 * next page, take one from `*cursor` first. Where a page was empty without a heading to hold, no page of this
 * capacity holds that line.
 *
 * A page takes time in proportion to its records times the header's descriptors; refuse a header that counts
 * more of these than you expect.
 */
KSP_API int KSPParseSnapshotBufferWithInplaceParser(const void* records, uint64_t length, char* out,
                                                    uint64_t* size, const void* header, uint32_t* cursor);

KSP_END_DECLARATIONS

#endif
