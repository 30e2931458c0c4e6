// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/host/policy.h"

namespace host {

/// What the activity has done since the process started.
struct Metrics {
  uint64_t runs = 0;
  uint64_t stepsPassed = 0;
  uint64_t stepsFailed = 0;
  /// By reason: runs that were deferred, and times at which one was held back.
  std::array<uint64_t, kReasonCount> deferrals{};
  std::chrono::milliseconds runTime{};
  /// As the last reply told; none before it.
  std::optional<bool> workPending;
  /// When the last run finished that was not deferred, in seconds since 1970; none before it.
  std::optional<int64_t> lastFinish;
};

/// Returns the metrics in the text format of an exporter's textfile collector.
std::string exposition(const Metrics& metrics);

/// Replaces a file by one with the text, readable for all, by way of `path`.new: a reader finds the old file
/// or the whole new one. Returns 0, or the error's number with the file as it was.
int replaceFile(const std::string& path, std::string_view text);

}  // namespace host
