// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/series/wide.h"

#include <array>

namespace kspdump {

std::string Wide::text() const {
  const Wide positive = magnitude();
  if (positive.high_ == 0) return (isNegative() ? "-" : "") + std::to_string(positive.low_);
  constexpr uint64_t kChunk = 1000000000;
  constexpr size_t kChunkDigits = 9;
  std::array<uint64_t, 4> limbs = {positive.high_ >> 32, positive.high_ & 0xFFFFFFFF, positive.low_ >> 32,
                                   positive.low_ & 0xFFFFFFFF};
  std::string text;
  for (bool isLeft = true; isLeft;) {
    uint64_t remainder = 0;
    isLeft = false;
    for (uint64_t& limb : limbs) {
      const uint64_t part = remainder << 32 | limb;
      limb = part / kChunk;
      remainder = part % kChunk;
      isLeft |= limb != 0;
    }
    std::string digits = std::to_string(remainder);
    if (isLeft) digits.insert(0, kChunkDigits - digits.size(), '0');
    text.insert(0, digits);
  }
  return (isNegative() ? "-" : "") + text;
}

}  // namespace kspdump
