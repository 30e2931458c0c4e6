// SPDX-License-Identifier: Apache-2.0
#ifndef PLATFORM_DRIVER_SERVICE_H
#define PLATFORM_DRIVER_SERVICE_H

/*
 * The registry of drivers, and calls to them.
 *
 * Service and connection handles are 32-bit, 0 is no handle; whoever was given one gives it back, once. An
 * int32_t result of 0 is success, any other a code of the platform's. Any thread may call.
 */

#include <stddef.h>
#include <stdint.h>

#include "api.h"

PLATFORM_BEGIN_DECLARATIONS

typedef struct MatchingRequest MatchingRequest;

enum { DefaultRegistry = 0 };

/** Key of the driver property by which this platform's registry matches. */
PLATFORM_API extern const char PropertyMatchKey[];

/** Builds a request for services of the NUL-terminated class, or returns null when it cannot be built. */
PLATFORM_API MatchingRequest* ServiceMatchByClass(const char* className);

/**
 * Returns a handle to the first registered service that matches, or 0. Consumes `request` in every case; the
 * caller releases the service with `ReleaseServiceObject`.
 */
PLATFORM_API uint32_t GetMatchingService(uint32_t registry, MatchingRequest* request);

/**
 * Opens a connection of the calling process (`getpid()`) to a service.
 *
 * Sets `*connection` on success and leaves it unchanged on failure. The connection outlives the service
 * handle; the caller closes it with `CloseServiceConnection`.
 */
PLATFORM_API int32_t OpenServiceConnection(uint32_t service, int32_t process, uint32_t type,
                                           uint32_t* connection);

/**
 * Calls a method of the driver, by number.
 *
 * `input` holds `inputSize` bytes. `*outputSize` is the room at `output` in bytes on entry and the bytes
 * written on return: 0 when the call is refused. A call that fails may have written all the same.
 */
PLATFORM_API int32_t CallStructMethod(uint32_t connection, uint32_t method, const void* input,
                                      size_t inputSize, void* output, size_t* outputSize);

/** Closes a connection. A handle that is not open, 0 among them, is refused with a nonzero result. */
PLATFORM_API int32_t CloseServiceConnection(uint32_t connection);

/** Releases a service handle. One that is not held, 0 among them, is refused with a nonzero result. */
PLATFORM_API int32_t ReleaseServiceObject(uint32_t service);

PLATFORM_END_DECLARATIONS

#endif
