// SPDX-License-Identifier: Apache-2.0
#ifndef PLATFORM_BACKGROUND_ACTIVITY_H
#define PLATFORM_BACKGROUND_ACTIVITY_H

/*
 * Background activities: work that the platform schedules, and that yields when the platform asks.
 *
 * The platform declares when an activity runs; a process attaches a handler to it. The handler is called on a
 * thread of the platform's, never twice at once, and asks for the state that it was called for.
 */

#include <stdbool.h>

#include "api.h"

PLATFORM_BEGIN_DECLARATIONS

typedef struct Activity Activity;
typedef struct ActivityCriteria ActivityCriteria;
typedef void (*ActivityHandler)(Activity* activity);

enum {
  ActivityStateCheckIn = 0,
  ActivityStateRun = 2,
  ActivityStateDefer = 3,
};

/** Criteria that attach to the activity as the platform declared it, adding none. */
PLATFORM_API extern const ActivityCriteria* const ActivityCheckIn;

/** Attaches `handler` to the activity that the platform knows under the NUL-terminated `identifier`. */
PLATFORM_API void RegisterActivity(const char* identifier, const ActivityCriteria* criteria,
                                   ActivityHandler handler);

/** Returns the activity's current state. */
PLATFORM_API int GetActivityState(Activity* activity);

/** Returns whether the platform wants the activity to yield now; asked during a run, as often as wanted. */
PLATFORM_API bool ActivityShouldDefer(Activity* activity);

/** Changes the activity's state; false, with the state as it was, for a change that is not allowed. */
PLATFORM_API bool SetActivityState(Activity* activity, int state);

/** Declares that the process has no outstanding work; the platform may end it from then on. */
PLATFORM_API void ExitTransactionClean(void);

PLATFORM_END_DECLARATIONS

#endif
