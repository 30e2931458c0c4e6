// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_KEY_ENTRY_HPP
#define KSP_DETAIL_KEY_ENTRY_HPP

#include <cstdint>

#include "ksp/detail/key_name.hpp"

namespace ksp {

/// A row of a key table: a statistic that a stream's keys define.
struct KeyEntry {
  uint16_t key;
  KeyName name;
  /// Elements that a record is to carry.
  uint16_t count;
  /// Bytes of an element.
  uint16_t width = 8;

  /// Its elements bear an index behind the name.
  [[nodiscard]] constexpr bool isArray() const { return count > 1; }
};

}  // namespace ksp

#endif
