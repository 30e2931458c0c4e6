// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_DECIMAL_HPP
#define KSP_DETAIL_DECIMAL_HPP

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace ksp {

/// Characters that `writeDecimal` needs room for.
inline constexpr size_t kDecimalRoom = 24;

namespace decimal {

inline constexpr uint64_t kEightDigits = 100000000;
inline constexpr uint64_t kZeros = 0x3030303030303030;

/// The eight digits of a number below 10^8, each a byte of the result, the first the lowest.
///
/// Three times each lane of the number is split in two by a division, the quotient in its lower half and the
/// remainder in its upper one: with quotient q, `(n << half) + q * (1 - (divisor << half))`.
inline uint64_t eightDigits(uint64_t number) {
  const uint64_t q4 = number * 109951163 >> 40;
  const uint64_t fours = (number << 32) + q4 * (1 - (uint64_t{10000} << 32));
  const uint64_t q2 = fours * 10486 >> 20 & 0x0000007F0000007F;
  const uint64_t twos = (fours << 16) + q2 * (1 - (uint64_t{100} << 16));
  const uint64_t q1 = twos * 103 >> 10 & 0x000F000F000F000F;
  return (twos << 8) + q1 * (1 - (uint64_t{10} << 8));
}

/// Digits in front of the first that is not 0, or of the last.
inline unsigned leadingZeros(uint64_t digits) {
  return static_cast<unsigned>(std::countr_zero(digits | uint64_t{1} << 63)) / 8;
}

inline void store(char* text, uint64_t bytes) {
  if constexpr (std::endian::native == std::endian::big) bytes = __builtin_bswap64(bytes);
  std::memcpy(text, &bytes, sizeof bytes);
}

}  // namespace decimal

/// Writes `number`, which is below 10^8, in decimal; otherwise like `writeDecimal`.
inline char* writeShortDecimal(char* text, uint64_t number) {
  const uint64_t digits = decimal::eightDigits(number);
  const unsigned zeros = decimal::leadingZeros(digits);
  decimal::store(text, (digits | decimal::kZeros) >> 8 * zeros);
  return text + 8 - zeros;
}

/// Writes `number` in decimal, without a terminator, and returns where the text ends.
///
/// `text` has room for `kDecimalRoom` characters; those behind the text are set to 0 or left as they were.
/// There is no loop over the digits: no processor foresees how many the next number has.
inline char* writeDecimal(char* text, uint64_t number) {
  using namespace decimal;
  if (number < kEightDigits) [[likely]]
    return writeShortDecimal(text, number);
  const uint64_t upper = number / kEightDigits;
  if (upper < kEightDigits) [[likely]] {
    text = writeShortDecimal(text, upper);
  } else {
    text = writeShortDecimal(text, upper / kEightDigits);
    store(text, eightDigits(upper % kEightDigits) | kZeros);
    text += 8;
  }
  store(text, eightDigits(number % kEightDigits) | kZeros);
  return text + 8;
}

}  // namespace ksp

#endif
