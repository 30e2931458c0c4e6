#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace ksp {

/// The name of a statistic in a key table.
///
/// It stands in the row itself and is padded with zeros, so that it is copied at a constant size.
class KeyName {
 public:
  static constexpr size_t kRoom = 56;

  template <size_t size>
  consteval KeyName(const char (&literal)[size]) : length_(size - 1) {  // NOLINT(google-explicit-constructor)
    static_assert(size <= kRoom, "a name and its terminator fit");
    std::copy_n(literal, size, text_);
  }

  /// NUL-terminated; all `kRoom` characters can be read.
  [[nodiscard]] constexpr const char* data() const { return text_; }
  [[nodiscard]] constexpr size_t size() const { return length_; }
  constexpr operator std::string_view() const {
    return {text_, length_};
  }  // NOLINT(google-explicit-constructor)

 private:
  char text_[kRoom]{};
  uint8_t length_;
};

}  // namespace ksp
