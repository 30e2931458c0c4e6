#pragma once

/// Attaches the activity handler to the daemon's background activity.
void registerActivityHandler();
