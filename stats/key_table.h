#pragma once

#include <cstdint>

#include "context/key_index.h"
#include "context/key_name.h"

namespace ksp {

/// A statistic that the stream's keys define.
struct StatsKey {
  uint16_t key;
  KeyName name;
  /// Values that a record is to carry; more than one makes it an array.
  uint16_t count;

  [[nodiscard]] constexpr bool isArray() const { return count > 1; }
};

/// Every defined statistic, in ascending key order.
inline constexpr StatsKey kStatsKeys[] = {
#include "stats/key_table.inc"
};

/// Returns the statistic of `key`, or null for an undefined one, at the same cost for every key.
inline const StatsKey* findStatsKey(uint32_t key) {
  return findByKey<kStatsKeys>(key);
}

}  // namespace ksp
