// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_LITTLE_ENDIAN_HPP
#define KSP_DETAIL_LITTLE_ENDIAN_HPP

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace ksp {

/// Reads the unsigned little-endian integer in the first `width` bytes, 8 at most, whatever the host's order.
inline uint64_t loadLittleEndian(const unsigned char* bytes, size_t width) {
  if constexpr (std::endian::native == std::endian::little) {
    // The usual widths are one load each.
    if (width == sizeof(uint64_t)) {
      uint64_t word;
      std::memcpy(&word, bytes, sizeof word);
      return word;
    }
    if (width == sizeof(uint32_t)) {
      uint32_t word;
      std::memcpy(&word, bytes, sizeof word);
      return word;
    }
  }
  uint64_t value = 0;
  while (width > 0) value = value << 8 | bytes[--width];
  return value;
}

/// Reads an unsigned little-endian integer as wide as `Number`.
template <class Number>
Number loadLittleEndian(const unsigned char* bytes) {
  return static_cast<Number>(loadLittleEndian(bytes, sizeof(Number)));
}

}  // namespace ksp

#endif
