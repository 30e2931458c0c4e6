// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_API_H
#define KSP_API_H

/* What every public header of libksp needs: fixed-width integers, export and C linkage. */

#include <stdint.h>

#define KSP_API __attribute__((__visibility__("default")))

#ifdef __cplusplus
#define KSP_BEGIN_DECLARATIONS extern "C" {
#define KSP_END_DECLARATIONS }
#else
#define KSP_BEGIN_DECLARATIONS
#define KSP_END_DECLARATIONS
#endif

#endif
