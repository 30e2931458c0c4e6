// SPDX-License-Identifier: Apache-2.0
#ifndef PLATFORM_SYSTEM_LOG_H
#define PLATFORM_SYSTEM_LOG_H

#include "api.h"

PLATFORM_BEGIN_DECLARATIONS

/** Writes one printf-style message to the system's log at its default level. Any thread may call. */
PLATFORM_API void SystemLog(const char* format, ...) __attribute__((format(printf, 1, 2)));

PLATFORM_END_DECLARATIONS

#endif
