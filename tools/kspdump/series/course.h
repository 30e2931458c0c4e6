// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <optional>
#include <span>

#include "tools/kspdump/series/wide.h"

namespace kspdump {

/// The least and the greatest of the numbers taken; none where there was none.
template <class Number>
struct Extremes {
  std::optional<Number> least;
  std::optional<Number> greatest;

  void take(const Number& number) {
    least = std::min(least.value_or(number), number);
    greatest = std::max(greatest.value_or(number), number);
  }
};

/// What a value grew by; none where it is missing before or after.
std::optional<Wide> changeOf(const std::optional<Wide>& before, const std::optional<Wide>& after);

/// That in percent of what it was; none where that was 0.
std::optional<double> percentOf(const std::optional<Wide>& before, const std::optional<Wide>& after);

/// How a value went over points, of which there is one at least; it may be missing at some.
struct Course {
  explicit Course(std::span<const std::optional<Wide>> values);

  std::optional<Wide> first;
  std::optional<Wide> last;
  std::optional<Wide> change;
  std::optional<double> percent;
  Extremes<Wide> extremes;
  std::optional<double> mean;
};

}  // namespace kspdump
