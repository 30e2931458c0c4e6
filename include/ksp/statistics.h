// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_STATISTICS_H
#define KSP_STATISTICS_H

/*
 * Parsers of the statistics stream, the controller's lifetime statistics.
 *
 * `stream` holds `length` bytes of any alignment; bytes behind the last whole 64-bit word are ignored. A null
 * stream is an empty one. Any bytes are safe as input. Entries are appended to what the context holds, in
 * stream order, and stay there whatever the result.
 */

#include <stdint.h>

#include "ksp/api.h"
#include "ksp/context.h"

KSP_BEGIN_DECLARATIONS

/**
 * Appends every record under its statistic's name, and records of unknown keys as `Stat_<key>`.
 *
 * The elements of an array statistic are named `<name>_<index>`, a lone one `<name>_`; several values of an
 * unknown key `Stat_<key>_<index>`. Returns the number of values dealt with, a single value that could not be
 * appended included. Ends early at an end marker, at a bad header, or when an array or a record of an unknown
 * key could not be appended. A failed append, and an array that differs from its configured size, are
 * reported in the error-message store. With a null `context` every append fails.
 */
KSP_API uint32_t KSPFTLParseBufferToCxt(GenericParserContext* context, const void* stream, uint32_t length);

/** As `KSPFTLParseBufferToCxt`, but names every record by its key number. */
KSP_API uint32_t KSPFTLParseStatKeyBufferToCxt(GenericParserContext* context, const void* stream,
                                               uint32_t length);

/**
 * Appends every record of a known key and fills the summary block.
 *
 * The elements of an array statistic are named `<name><index>`, a lone one `<name>`; records shorter than
 * their key needs are cut to the values they have. Returns 1 when the stream was consumed to its last whole
 * word. Returns 0 for a stream without one (only `parseMarker` is written then), and when a bad header ended
 * it (`exportVersion` is set to 0, all else stays). A null `context` gives 0. Reports nothing in the
 * error-message store; an entry for which there was no memory is missing.
 */
KSP_API int KSPParseBufferToCxt(KSPParseContext* context, const void* stream, uint32_t length);

KSP_END_DECLARATIONS

#endif
