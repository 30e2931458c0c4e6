// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <compare>
#include <cstdint>
#include <string>

namespace kspdump {

/// A signed whole number of 128 bits: wide enough for the sum of any record's values, for the difference of
/// any two. Exact on every processor.
class Wide {
 public:
  constexpr Wide() = default;
  constexpr Wide(uint64_t value) : low_(value) {}  // NOLINT(google-explicit-constructor): loses nothing

  constexpr Wide& operator+=(Wide other) {
    low_ += other.low_;
    high_ += other.high_ + (low_ < other.low_ ? 1 : 0);
    return *this;
  }
  constexpr Wide operator-() const { return {~high_ + (low_ == 0 ? 1 : 0), ~low_ + 1}; }
  constexpr Wide& operator-=(Wide other) { return *this += -other; }
  friend constexpr Wide operator+(Wide a, const Wide& b) { return a += b; }
  friend constexpr Wide operator-(Wide a, const Wide& b) { return a -= b; }

  constexpr bool operator==(const Wide&) const = default;
  constexpr std::strong_ordering operator<=>(const Wide& other) const {
    const auto high = static_cast<int64_t>(high_) <=> static_cast<int64_t>(other.high_);
    return std::is_neq(high) ? high : low_ <=> other.low_;
  }

  [[nodiscard]] constexpr bool isNegative() const { return static_cast<int64_t>(high_) < 0; }
  /// The number itself where it is one of 64 bits.
  [[nodiscard]] constexpr uint64_t low() const { return low_; }
  [[nodiscard]] constexpr Wide magnitude() const { return isNegative() ? -*this : *this; }

  /// The nearest that a double comes.
  explicit operator double() const {
    constexpr double kLowRange = 18446744073709551616.0;
    const Wide positive = magnitude();
    const double value = static_cast<double>(positive.high_) * kLowRange + static_cast<double>(positive.low_);
    return isNegative() ? -value : value;
  }

  /// In decimal.
  [[nodiscard]] std::string text() const;

 private:
  constexpr Wide(uint64_t high, uint64_t low) : high_(high), low_(low) {}

  uint64_t high_ = 0;
  uint64_t low_ = 0;
};

}  // namespace kspdump
