// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "tools/kspdump/decode/capture.h"
#include "tools/kspdump/series/wide.h"

namespace kspdump {

/// The fewest columns that a picture has.
inline constexpr size_t kLeastBars = 8;

/// Appends a bar from the left, as long as `value` is of `largest`, which has `width` columns.
void appendBar(std::string& out, uint64_t value, uint64_t largest, size_t width);

/// Appends a picture of values, at most `width` characters, scaled to the largest.
void appendBars(std::string& out, const Values& values, size_t width);

/// Appends a picture of changes, each of a value of 64 bits, at most `width` characters, scaled to the
/// largest: those that fall hang from above.
void appendChanges(std::string& out, std::span<const Wide> changes, size_t width);

/// Appends a picture of values over a series' points, blank where there is none, at most `width` characters.
void appendSparkline(std::string& out, std::span<const std::optional<double>> values, size_t width);

}  // namespace kspdump
