// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/kspdump/series/series.h"

namespace kspdump {

/// What people work out from a snapshot's fields: one field by another, interval for interval.
struct Ratio {
  /// Both fields' names, as in "NW/HW", and the element's index where they are arrays: "RL/RO_0".
  std::string name;
  /// Tracks of the series, and the element of theirs.
  size_t dividend;
  size_t divisor;
  uint32_t element;
};

/// The mean latency for each direction and priority (total latency by operations), as far as a series has
/// their fields, and the write amplification (media writes by host writes).
std::vector<Ratio> ratiosOf(const Series& series);

/// A ratio at a point; none where nothing would be divided by.
std::optional<double> ratioAt(const Series& series, const Ratio& ratio, size_t point);

/// The ratio of the fields' sums over all points.
std::optional<double> ratioOverall(const Series& series, const Ratio& ratio);

}  // namespace kspdump
