// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_MEDIA_STATISTICS_H
#define KSP_MEDIA_STATISTICS_H

/* Parser of the media statistics stream: read outcomes, die temperatures, retraining, firmware updates. */

#include <stdint.h>

#include "ksp/api.h"
#include "ksp/context.h"

KSP_BEGIN_DECLARATIONS

/**
 * Appends every record of a known key, several elements as `<name><index>` and a lone one as `<name>`.
 *
 * `buffer` holds `length` bytes of any alignment; any bytes are safe as input. Returns the number of values
 * appended by records that were appended whole. Ends at an end record, at a record that runs past the buffer,
 * or when a record could not be appended. A null or empty buffer, a record that differs from its configured
 * size and a failed append are reported in the error-message store. With a null `context` every append fails.
 */
KSP_API uint32_t KSPMSPParseBufferToCxt(GenericParserContext* context, const void* buffer, uint32_t length);

KSP_END_DECLARATIONS

#endif
