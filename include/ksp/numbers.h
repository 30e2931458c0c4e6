// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_NUMBERS_H
#define KSP_NUMBERS_H

/* Numbers as people quote them. */

#include <stdint.h>

#include "ksp/api.h"

KSP_BEGIN_DECLARATIONS

/**
 * Rounds `value`, half up, to `digits` significant decimal digits.
 *
 * A value with no more digits than that comes back unchanged; 0 when more than 18 digits would be dropped;
 * the largest unsigned 64-bit value when the rounded one would exceed it. Digits are counted in double
 * precision, so a value just below a power of ten beyond 2^53 may count one digit more than it has.
 */
KSP_API uint64_t roundSig(uint64_t value, uint64_t digits);

/**
 * Returns the nominal capacity in gigabytes by which a device with this user capacity is sold.
 *
 * `capacity` is in megabytes, 1024 to the gigabyte. The result is the smallest power of two above the
 * capacity, but 1536 from 1376256 to 1770495 megabytes, and 0 below 512.
 */
KSP_API int32_t GetUserCapacityInGB(uint32_t capacity);

KSP_END_DECLARATIONS

#endif
