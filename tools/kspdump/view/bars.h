// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "tools/kspdump/series/wide.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

/// The fewest columns that a picture has.
inline constexpr size_t kLeastBars = 8;
/// Heights above nothing that a picture's bars have.
inline constexpr unsigned kBarLevels = 8;

/// The picture of a height: 0 for nothing, at most `kBarLevels`.
const char* bar(size_t level);

/// The height of a value beside the largest.
template <class Number>
size_t levelOf(const Number& value, const Number& largest) {
  size_t level = value == Number(0) ? 0 : 1;
  while (level != 0 && level < kBarLevels && value * kBarLevels > largest * static_cast<unsigned>(level))
    ++level;
  return level;
}

/// Appends a bar from the left, as long as `value` is of `largest`, which has `width` columns.
void appendBar(std::string& out, uint64_t value, uint64_t largest, size_t width);

/// Appends a picture of `values`, none negative, at most `width` characters, scaled to the largest.
///
/// `Number` holds `kBarLevels` times any of the values.
template <class Number>
void appendBars(std::string& out, std::span<const Number> values, size_t width) {
  if (values.empty()) return;
  const Number largest = *std::max_element(values.begin(), values.end());
  const size_t bars = std::min(values.size(), width);
  for (size_t i = 0; i < bars; ++i) {
    // Where there are more values than columns, each column shows the largest of its share.
    const auto first = values.begin() + static_cast<std::ptrdiff_t>(i * values.size() / bars);
    const auto last = values.begin() + static_cast<std::ptrdiff_t>((i + 1) * values.size() / bars);
    const Number value = *std::max_element(first, last);
    out += bar(levelOf(value, largest));
  }
}

/// Appends a picture of changes, at most `width` characters, scaled to the largest: those that fall hang from
/// above.
void appendChanges(std::string& out, std::span<const Wide> changes, size_t width);

/// Appends a picture of values over a series' points, blank where there is none, at most `width` characters.
void appendSparkline(std::string& out, std::span<const std::optional<double>> values, size_t width);

}  // namespace kspdump
