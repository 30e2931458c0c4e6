// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_KEY_INDEX_HPP
#define KSP_DETAIL_KEY_INDEX_HPP

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <iterator>

namespace ksp {

/// Finds the row of `key` in a constant table of rows in ascending key order; null when there is none.
///
/// The place of every key up to the greatest is computed at compile time, so each lookup is one load.
template <const auto& rows>
auto findByKey(uint32_t key) -> decltype(std::data(rows)) {
  using Row = std::iter_value_t<decltype(std::data(rows))>;
  static_assert(std::ranges::is_sorted(rows, std::ranges::less_equal{}, &Row::key),
                "each key once, in order");
  static_assert(std::size(rows) < UINT16_MAX);
  // 1-based; 0 for a key without a row.
  static constexpr auto kPlaces = [] {
    std::array<uint16_t, std::size_t{std::rbegin(rows)->key} + 1> places{};
    uint16_t place = 0;
    for (const Row& row : rows) places[row.key] = ++place;
    return places;
  }();
  return key < kPlaces.size() && kPlaces[key] != 0 ? std::data(rows) + kPlaces[key] - 1 : nullptr;
}

}  // namespace ksp

#endif
