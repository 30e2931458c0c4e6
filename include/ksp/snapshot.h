#ifndef KSP_SNAPSHOT_H
#define KSP_SNAPSHOT_H

/* Text reports of the controller's timed snapshots. Neither renderer allocates or keeps state. */

#include <stdint.h>

#include "ksp/api.h"

KSP_BEGIN_DECLARATIONS

/**
 * Renders fixed-layout snapshot records as a text report: a legend, a line a record, an empty line.
 *
 * `records` holds `length` bytes, 252 per record; a shorter tail is ignored. `*size` is the capacity of
 * `out` in bytes on entry and the text's length, without its NUL, on success.
 * Returns 1 when the whole report fits; else 0, `*size` unchanged and `out` holding the text up to the
 * piece that did not fit. Any bytes are safe as input.
 */
KSP_API int KSPParseSnapshotBuffer(const void* records, uint64_t length, char* out, uint64_t* size);

/**
 * Renders one page of a snapshot whose record layout a header describes.
 *
 * `records` holds `length` bytes; any bytes are safe. `header` may be null; otherwise the caller must have
 * fetched it whole: its 36 fixed bytes, the NUL-terminated title behind them, and the descriptor table at
 * the header's own table offset, 8 bytes and 28 for each of the descriptors that it counts. Numbers and
 * formats within that extent may be hostile. `*size` is the capacity of `out` in bytes on entry and the
 * page's length with its NUL on return. `*cursor` is the record to go on with: 0 before the first page, and
 * for each next page what the call left there.
 *
 * A page begins with the time of its rendering and, the first, with a legend or title; it then has a line for
 * each record that is in use. Its text is empty when it has no such line.
 * Returns 1 when no record is left. Returns 0 when the page was too small: the record whose line did not fit
 * is passed over, so offer room for the heading and the longest line; or, with everything untouched, when
 * `header` is null.
 */
KSP_API int KSPParseSnapshotBufferWithInplaceParser(const void* records, uint64_t length, char* out,
                                                    uint64_t* size, const void* header, uint32_t* cursor);

KSP_END_DECLARATIONS

#endif
