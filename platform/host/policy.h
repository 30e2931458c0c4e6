// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/host/host_file.h"

namespace host {

/// Why the activity must yield.
enum class Reason { kNone, kStop, kCheck, kTime, kBattery, kPressure };
inline constexpr size_t kReasonCount = 6;

/// What a run tells about itself.
struct RunFigures {
  bool stopRequested = false;
  /// Questions whether to yield, the present one included.
  uint32_t questions = 0;
  std::chrono::nanoseconds lasted{};
};

/// What the machine tells about itself; what it cannot tell is absent.
struct MachineFigures {
  std::optional<bool> onBattery;
  std::optional<double> ioPressurePercent;
};

/// Returns the first reason of the run's own for which it must yield.
Reason reasonOfRun(const YieldSettings& settings, const RunFigures& figures);

/// Returns the first reason of the machine's for which no run may begin and one that lasts must yield. A
/// condition about which the machine tells nothing does not hold.
Reason reasonOfMachine(const YieldSettings& settings, const MachineFigures& figures);

/// Returns a reason in words, empty for none.
std::string describe(Reason reason, const YieldSettings& settings);

/// Returns a reason as metrics name it, in one word.
std::string_view label(Reason reason);

}  // namespace host
