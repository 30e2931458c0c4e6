// SPDX-License-Identifier: Apache-2.0
#ifndef PLATFORM_API_H
#define PLATFORM_API_H

/* What every header of the platform seam needs: fixed-width integers, export and C linkage. */

#include <stdint.h>

#define PLATFORM_API __attribute__((visibility("default")))

#ifdef __cplusplus
#define PLATFORM_BEGIN_DECLARATIONS extern "C" {
#define PLATFORM_END_DECLARATIONS }
#else
#define PLATFORM_BEGIN_DECLARATIONS
#define PLATFORM_END_DECLARATIONS
#endif

#endif
