// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

namespace host {

/// Returns whether the machine runs on its battery: one, or an uninterruptible supply, discharges and no
/// other supply is on line. `folder` is one as /sys/class/power_supply; none when it cannot be read. What
/// cannot be read in it counts as absent, and what has the scope of a device, such as a mouse, is not the
/// machine's.
std::optional<bool> runsOnBattery(const char* folder);

/// Returns the percentage of the last ten seconds in which some task waited for I/O, as a file like
/// /proc/pressure/io tells it; none when it cannot be read or holds no finite figure.
std::optional<double> ioPressurePercent(const char* file);

}  // namespace host
