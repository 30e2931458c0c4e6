// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/series/course.h"

namespace kspdump {

std::optional<Wide> changeOf(const std::optional<Wide>& before, const std::optional<Wide>& after) {
  if (!before || !after) return std::nullopt;
  return *after - *before;
}

std::optional<double> percentOf(const std::optional<Wide>& before, const std::optional<Wide>& after) {
  constexpr double kWhole = 100;
  const auto change = changeOf(before, after);
  if (!change || *before == Wide()) return std::nullopt;
  return static_cast<double>(*change) / static_cast<double>(*before) * kWhole;
}

Course::Course(std::span<const std::optional<Wide>> values)
    : first(values.front()),
      last(values.back()),
      change(changeOf(first, last)),
      percent(percentOf(first, last)) {
  Wide total;
  uint64_t count = 0;
  for (const auto& value : values) {
    if (!value) continue;
    extremes.take(*value);
    total += *value;
    ++count;
  }
  if (count != 0) mean = static_cast<double>(total) / static_cast<double>(count);
}

}  // namespace kspdump
