// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "ksp/detail/little_endian.hpp"

namespace ksp {

/// Bytes of the words that records and headers are made of.
inline constexpr size_t kWordBytes = 4;

/// Reads an unsigned word; `bytes` needs no alignment.
inline uint32_t loadWord(const uint8_t* bytes) {
  return loadLittleEndian<uint32_t>(bytes);
}

}  // namespace ksp
