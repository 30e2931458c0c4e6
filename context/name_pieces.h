// SPDX-License-Identifier: Apache-2.0
#pragma once

// What names are made of. Each `writePiece` writes a piece at `at`, where all is zero, cuts it at `end`, and
// returns where it ends.

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "ksp/detail/decimal.hpp"
#include "ksp/detail/key_name.hpp"

namespace ksp {

inline char* writePiece(char* at, const char* end, std::string_view piece) {
  const size_t size = std::min(piece.size(), static_cast<size_t>(end - at));
  std::memcpy(at, piece.data(), size);
  return at + size;
}

[[gnu::always_inline]] inline char* writePiece(char* at, const char* end, const KeyName& name) {
  if (static_cast<size_t>(end - at) < KeyName::kRoom) [[unlikely]] {
    return writePiece(at, end, std::string_view(name));
  }
  std::memcpy(at, name.data(), KeyName::kRoom);
  return at + name.size();
}

[[gnu::always_inline]] inline char* writePiece(char* at, const char* end, char piece) {
  if (at != end) *at++ = piece;
  return at;
}

/// The index of an element, counted up in decimal from 0 to 65535.
class Index {
 public:
  void operator++() {
    ++value_;
    const unsigned lastDigit = 8 * (size_ - 1);
    if (text_ >> lastDigit != '9') {
      text_ += uint64_t{1} << lastDigit;
    } else {
      text_ = afresh(value_);  // every tenth step
      size_ = (71 - static_cast<unsigned>(std::countl_zero(text_))) / 8;
    }
  }
  [[nodiscard]] uint32_t value() const { return value_; }

  [[gnu::always_inline]] char* write(char* at, const char* end) const {
    if (static_cast<size_t>(end - at) >= sizeof text_) [[likely]] {
      decimal::store(at, text_);
      return at + size_;
    }
    char text[sizeof text_];
    decimal::store(text, text_);
    return writePiece(at, end, std::string_view(text, size_));
  }

 private:
  // Not inlined, as the compiler would carry its intermediate products through the whole loop.
  [[gnu::noinline]] static uint64_t afresh(uint32_t value) {
    const uint64_t digits = decimal::eightDigits(value);
    return (digits | decimal::kZeros) >> 8 * decimal::leadingZeros(digits);
  }

  uint64_t text_ = '0';  // the first digit in the lowest byte
  unsigned size_ = 1;
  uint32_t value_ = 0;
};

[[gnu::always_inline]] inline char* writePiece(char* at, const char* end, const Index& index) {
  return index.write(at, end);
}

}  // namespace ksp
