// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_MSP_KEYS_HPP
#define KSP_DETAIL_MSP_KEYS_HPP

#include <algorithm>
#include <cstdint>

#include "ksp/detail/key_entry.hpp"
#include "ksp/detail/key_index.hpp"

namespace ksp {

using MSPKeyEntry = KeyEntry;

/// Every media statistic, in ascending key order. Five names are borne by two keys each.
inline constexpr MSPKeyEntry mspKeyTable[] = {
#include "ksp/detail/msp_keys.inc"
};

/// Returns the statistic of `key`, or null for an unknown one, at the same cost for every key.
inline const MSPKeyEntry* LookupMSPKey(uint16_t key) {
  return findByKey<mspKeyTable>(key);
}

/// Bytes of an element of any key, known or not: the upper keys are those of wide elements.
constexpr uint32_t mspElementWidth(uint16_t key) {
  return key < 0x3000 ? 4 : 8;
}
static_assert(std::ranges::all_of(mspKeyTable, [](const MSPKeyEntry& row) {
  return row.width == mspElementWidth(row.key);
}));

}  // namespace ksp

#endif
