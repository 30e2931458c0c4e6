// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "ksp/detail/decimal.hpp"

namespace ksp {

/// How a number is shown: a short text in front, then the digits, right-aligned in at least `width` columns.
struct NumberFormat {
  static constexpr size_t kLongestPrefix = 8;
  static constexpr unsigned kWidestField = 8;

  char prefix[kLongestPrefix] = {};
  uint8_t prefixLength = 0;
  uint8_t width = 0;
  char fill = ' ';

  /// Takes the same notation as printf, of which it knows PREFIX%Nu and PREFIX%0Nu, N being one digit from 1
  /// to 8. Anything else does not compile.
  template <size_t Size>
  consteval NumberFormat(const char (&notation)[Size]) {
    if (!read({notation, Size - 1})) notationIsUnknown();
  }

  static constexpr bool isNotation(std::string_view text) { return NumberFormat().read(text); }

 private:
  constexpr NumberFormat() = default;
  // Not constant, so that a constant expression cannot get here.
  static void notationIsUnknown();

  constexpr bool read(std::string_view text) {
    const size_t percent = std::min(text.find('%'), text.size());
    if (percent > kLongestPrefix) return false;
    std::copy_n(text.begin(), percent, prefix);
    prefixLength = static_cast<uint8_t>(percent);
    text.remove_prefix(percent);
    const bool isPadded = text.starts_with("%0");
    if (isPadded) fill = '0';
    text.remove_prefix(std::min<size_t>(isPadded ? 2 : 1, text.size()));
    if (text.size() != 2 || text[0] < '1' || text[1] != 'u') return false;
    width = static_cast<uint8_t>(text[0] - '0');
    return width <= kWidestField;
  }
};
static_assert(NumberFormat::isNotation("%8u") && NumberFormat::isNotation(" R=%04u"));
static_assert(!NumberFormat::isNotation("%12u") && !NumberFormat::isNotation("%9u") &&
              !NumberFormat::isNotation("%0u") && !NumberFormat::isNotation("%u") &&
              !NumberFormat::isNotation("%4d") && !NumberFormat::isNotation("%4u ") &&
              !NumberFormat::isNotation("no number") && !NumberFormat::isNotation("too long %4u"));

constexpr size_t kMostDigits = 10;

/// The longest text that `putNumber` makes.
constexpr size_t kLongestNumber = NumberFormat::kLongestPrefix + kMostDigits;

/// What `putNumber` may write to: it stores whole blocks, up to eight bytes behind its text.
constexpr size_t kNumberRoom = kLongestNumber + 8;

namespace number_detail {

// For a number of bit width b, adding entry b and keeping the upper half gives the count of its digits: the
// entry holds that count and, below it, what makes the sum carry from the next power of ten on.
constexpr std::array<uint64_t, 33> kDigitCount = [] {
  std::array<uint64_t, 33> table = {};
  uint64_t power = 10;  // the lowest power of ten above every number of fewer digits
  uint64_t digits = 1;
  for (unsigned width = 0; width <= 32; ++width) {
    const uint64_t lowest = width == 0 ? 0 : uint64_t{1} << (width - 1);
    while (lowest >= power) {
      power *= 10;
      ++digits;
    }
    const uint64_t highest = (uint64_t{1} << width) - 1;
    table[width] = highest >= power ? ((digits + 1) << 32) - power : digits << 32;
  }
  return table;
}();

inline uint32_t digitCount(uint32_t value) {
  return static_cast<uint32_t>((value + kDigitCount[static_cast<size_t>(std::bit_width(value))]) >> 32);
}

}  // namespace number_detail

/// Writes `value` as `format` says and returns the end of the text; no NUL follows.
///
/// `at` has kNumberRoom bytes of room, all of which may be written. No step depends on how many digits there
/// are: in reports that count is as good as random, and each wrong guess would cost more than all digits.
inline char* putNumber(char* at, const NumberFormat& format, uint32_t value) {
  std::memcpy(at, format.prefix, sizeof format.prefix);
  at += format.prefixLength;
  const uint32_t digits = number_detail::digitCount(value);
  const uint32_t length = std::max<uint32_t>(digits, format.width);
  std::memset(at, format.fill, NumberFormat::kWidestField);

  // The digits are stored left-aligned: the ninth and tenth from the right, which mostly do not exist and are
  // then stored over, and the eight last.
  const uint64_t last = decimal::eightDigits(value % decimal::kEightDigits) | decimal::kZeros;
  const auto first = static_cast<uint32_t>(value / decimal::kEightDigits);  // at most 42
  const uint32_t firstTwo = (0x3030 | first / 10 | first % 10 << 8) >> (digits == 9 ? 8 : 0);
  char* digit = at + (length - digits);
  digit[0] = static_cast<char>(firstTwo);
  digit[1] = static_cast<char>(firstTwo >> 8);
  const uint32_t beyondEight = std::max<uint32_t>(digits, 8) - 8;
  const uint32_t missing = 8 - std::min<uint32_t>(digits, 8);
  decimal::store(digit + beyondEight, last >> 8 * missing);
  return at + length;
}

/// A count of thousandths as the reports show it: the whole part and hundredths, the third decimal dropped.
struct Thousandths {
  uint32_t whole;
  uint32_t hundredths;

  explicit Thousandths(uint32_t value) : whole(value / 1000), hundredths(value % 1000 / 10) {}
};

}  // namespace ksp
