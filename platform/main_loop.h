// SPDX-License-Identifier: Apache-2.0
#ifndef PLATFORM_MAIN_LOOP_H
#define PLATFORM_MAIN_LOOP_H

#include "api.h"

PLATFORM_BEGIN_DECLARATIONS

/** Parks the main thread for good while the platform serves its callbacks on threads of its own. */
PLATFORM_API void RunMainLoop(void) __attribute__((noreturn));

PLATFORM_END_DECLARATIONS

#endif
