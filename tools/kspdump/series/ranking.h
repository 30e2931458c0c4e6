// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/kspdump/series/wide.h"

namespace kspdump {

/// Which tracks of a series are shown, and in which order.
struct Ranking {
  enum class Order {
    kKey,
    kName,
    kChange,   ///< the greatest first, whatever its sign
    kPercent,  ///< likewise; those that began with nothing behind them
  };

  Order order = Order::kKey;
  /// The most that are shown; 0 for all.
  size_t most = 0;
  /// Whether those that do not change are shown too.
  bool withUnchanged = false;
};

/// A single-valued statistic that a series goes over, with its value at each point.
struct Over {
  std::string name;
  std::vector<uint64_t> values;

  /// A change from the first point to the last by what these values went over meanwhile; none where they went
  /// over nothing.
  [[nodiscard]] std::optional<double> perUnit(const std::optional<Wide>& change) const;
};

}  // namespace kspdump
