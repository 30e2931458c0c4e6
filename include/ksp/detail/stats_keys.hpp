// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_STATS_KEYS_HPP
#define KSP_DETAIL_STATS_KEYS_HPP

#include <cstdint>

#include "ksp/detail/key_entry.hpp"
#include "ksp/detail/key_index.hpp"

namespace ksp {

/// Every statistic of the statistics stream, in ascending key order.
inline constexpr KeyEntry kStatsKeys[] = {
#include "ksp/detail/stats_keys.inc"
};

/// Returns the statistic of `key`, or null for an undefined one, at the same cost for every key.
inline const KeyEntry* findStatsKey(uint32_t key) {
  return findByKey<kStatsKeys>(key);
}

}  // namespace ksp

#endif
