// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>

#include "platform/host/host_file.h"

namespace host {

/// How a turn of the activity went: its run finished, was deferred, or was held back and never began.
enum class Turn { kFinished, kDeferred, kHeldBack };

/// Returns how long to wait for the first turn.
std::chrono::seconds pauseAtStart(const ActivitySettings& settings);

/// Returns how long to wait for the turn behind this one; none where there is no further one.
std::optional<std::chrono::seconds> pauseAfter(Turn turn, const ActivitySettings& settings);

}  // namespace host
