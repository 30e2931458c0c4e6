// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Attaches the activity handler to the daemon's background activity.
void registerActivityHandler();
