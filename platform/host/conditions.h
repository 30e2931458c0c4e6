#pragma once

#include <filesystem>
#include <optional>

namespace host {

/// Returns whether the machine runs on its battery: one discharges and no external supply is online.
/// `supplies` is a folder as /sys/class/power_supply; what cannot be read in it counts as absent.
bool runsOnBattery(const std::filesystem::path& supplies);

/// Returns the percentage of the last ten seconds in which some task waited for I/O, as a file like
/// /proc/pressure/io tells it; none when it cannot be read.
std::optional<double> ioPressurePercent(const std::filesystem::path& file);

}  // namespace host
