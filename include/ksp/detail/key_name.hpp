// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_KEY_NAME_HPP
#define KSP_DETAIL_KEY_NAME_HPP

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "ksp/detail/decimal.hpp"

namespace ksp {

/// The name of a statistic: one in a key table, or one made from a key number.
///
/// It holds its text, padded with zeros, so that it is copied at a constant size.
class KeyName {
 public:
  static constexpr size_t kRoom = 56;

  KeyName() = default;

  template <size_t size>
  consteval KeyName(const char (&literal)[size]) : length_(size - 1) {
    static_assert(size <= kRoom, "a name and its terminator fit");
    std::copy_n(literal, size, text_);
  }

  /// Becomes `stem` and `number` behind it; a stem has at most 8 characters.
  void assign(std::string_view stem, uint32_t number) {
    std::memset(text_, 0, kRoom);
    std::memcpy(text_, stem.data(), stem.size());
    length_ = static_cast<uint8_t>(writeDecimal(text_ + stem.size(), number) - text_);
  }

  /// NUL-terminated; all `kRoom` characters can be read.
  [[nodiscard]] constexpr const char* data() const { return text_; }
  [[nodiscard]] constexpr size_t size() const { return length_; }
  constexpr operator std::string_view() const { return {text_, length_}; }

 private:
  char text_[kRoom]{};
  uint8_t length_ = 0;
};

}  // namespace ksp

#endif
