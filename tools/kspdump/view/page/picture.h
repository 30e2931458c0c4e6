// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

namespace kspdump {

/// Small pictures for a table's cells, as SVG. Values that are not numbers are missing.

/// A bar a value, upwards or, where it is negative, downwards. Each value is asked for twice.
std::string drawBars(size_t count, const std::function<double(size_t)>& valueAt);

/// A line through the values. Of more values than columns it passes each column's least and greatest.
std::string drawLine(const std::vector<double>& values);

}  // namespace kspdump
