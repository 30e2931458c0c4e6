// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_ERROR_H
#define KSP_ERROR_H

/*
 * The error-message store: one text a process, the first that was reported.
 *
 * The generic and the media parsers report here what they could not use. There is no lock: callers that parse
 * on several threads serialise those calls.
 */

#include "ksp/api.h"

KSP_BEGIN_DECLARATIONS

/** The stored text, or null while there is none; read it through `GetAPIErrorMessage`. */
KSP_API extern char* GlobalAPIErrorMessage;

/**
 * Stores the formatted message, cut to 1023 characters, unless one is stored already.
 *
 * `format` is a printf format of the caller's own, never text from outside. When memory runs out nothing is
 * stored and a later call tries again.
 */
KSP_API void SetAPIErrorMessage(const char* format, ...) __attribute__((__format__(__printf__, 1, 2)));

/** Returns the stored message, or "NA" when there is none. The text is the library's, for good. */
KSP_API const char* GetAPIErrorMessage(void);

KSP_END_DECLARATIONS

#endif
