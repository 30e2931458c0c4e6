// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>

namespace host {

/// What the drivers tell the activity, on the thread that calls them; any thread but its handler's goes
/// unheard. `reply` is what the driver wrote, if it wrote.
void stepBegins();
void stepEnded(int32_t result, std::optional<uint32_t> reply);

}  // namespace host
