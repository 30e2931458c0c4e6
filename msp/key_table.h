#pragma once

#include <cstdint>

#include "context/key_index.h"
#include "context/key_name.h"

namespace ksp {

/// A media statistic that the stream's keys define.
struct MSPKeyEntry {
  uint16_t key;
  KeyName name;
  /// Elements that a record is to carry.
  uint8_t count;
  /// Bytes of an element.
  uint8_t width;
};

/// Every media statistic, in ascending key order. Five names are borne by two keys each.
inline constexpr MSPKeyEntry mspKeyTable[] = {
#include "msp/key_table.inc"
};

/// Returns the statistic of `key`, or null for an unknown one, at the same cost for every key.
inline const MSPKeyEntry* LookupMSPKey(uint16_t key) {
  return findByKey<mspKeyTable>(key);
}

}  // namespace ksp
