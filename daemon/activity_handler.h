// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/background_activity.h"

/// Works off the controller's pending BDR steps, yielding when the platform asks; acts in the run state
/// alone.
///
/// Called on a thread of the platform's, which it keeps for as long as work remains and nobody asks it to
/// yield. Declares the process clean as the last act of every run.
extern "C" void activityHandler(Activity* activity);
