#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace ksp {

/// Reads the unsigned little-endian integer in the first `width` bytes, 8 at most, whatever the host's order.
[[gnu::always_inline]] inline uint64_t loadLittleEndian(const unsigned char* bytes, size_t width) {
  uint64_t value = 0;
  if constexpr (std::endian::native == std::endian::little) {
    // The usual widths are one load each.
    if (width == 8) {
      std::memcpy(&value, bytes, 8);
    } else if (width == 4) {
      std::memcpy(&value, bytes, 4);
    } else {
      std::memcpy(&value, bytes, width);
    }
  } else {
    while (width > 0) value = value << 8 | bytes[--width];
  }
  return value;
}

}  // namespace ksp
