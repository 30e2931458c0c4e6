// SPDX-License-Identifier: Apache-2.0
#include "ksp/numbers.h"

#include <array>
#include <bit>
#include <cmath>
#include <limits>

namespace {

constexpr auto kPowersOfTen = [] {
  std::array<uint64_t, 19> powers{};
  uint64_t power = 1;
  for (uint64_t& entry : powers) {
    entry = power;
    power *= 10;
  }
  return powers;
}();

// Capacities sold as one and a half terabytes, in megabytes.
constexpr uint32_t kOddSizeFirst = 1344 * 1024;
constexpr uint32_t kOddSizeLast = 1729 * 1024 - 1;
constexpr int32_t kOddSizeInGB = 1536;

}  // namespace

uint64_t roundSig(uint64_t value, uint64_t digits) {
  if (value == 0) return 0;
  const auto present = static_cast<uint64_t>(std::log10(static_cast<double>(value)) + 1);
  if (present <= digits) return value;
  const uint64_t dropped = present - digits;
  if (dropped >= kPowersOfTen.size()) return 0;
  const uint64_t power = kPowersOfTen[static_cast<size_t>(dropped)];
  const uint64_t rounded = value / power + (value % power >= power / 2 ? 1 : 0);
  constexpr uint64_t kLargest = std::numeric_limits<uint64_t>::max();
  return rounded > kLargest / power ? kLargest : rounded * power;
}

int32_t GetUserCapacityInGB(uint32_t capacity) {
  if (capacity >= kOddSizeFirst && capacity <= kOddSizeLast) return kOddSizeInGB;
  if (capacity == 0) return 0;
  return static_cast<int32_t>((uint64_t{1} << std::bit_width(capacity)) / 1024);
}
