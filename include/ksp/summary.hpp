// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_SUMMARY_HPP
#define KSP_SUMMARY_HPP

/* Which statistics the summary block of a `KSPParseContext` copies. */

#include <cstdint>
#include <type_traits>

#include "ksp/context.h"
#include "ksp/detail/key_index.hpp"

namespace ksp {

/// A summary field that copies a single-valued statistic: its low 32 bits, or the whole value.
struct SummaryField {
  uint32_t key;
  uint32_t KSPParseContext::*low = nullptr;
  uint64_t KSPParseContext::*whole = nullptr;

  [[nodiscard]] constexpr uint64_t load(const KSPParseContext& context) const {
    return low != nullptr ? context.*low : context.*whole;
  }

  constexpr void store(KSPParseContext& context, uint64_t value) const {
    if (low != nullptr) {
      context.*low = static_cast<uint32_t>(value);
    } else {
      context.*whole = value;
    }
  }
};

/// In ascending key order.
inline constexpr SummaryField kSummaryFields[] = {
    {.key = 4, .whole = &KSPParseContext::hostWrites},
    {.key = 7, .whole = &KSPParseContext::hostReads},
    {.key = 12, .whole = &KSPParseContext::IND_pool_free},
    {.key = 13, .whole = &KSPParseContext::IND_pool_count},
    {.key = 17, .whole = &KSPParseContext::wearLevMoves},
    {.key = 18, .whole = &KSPParseContext::nandWrites},
    {.key = 19, .whole = &KSPParseContext::nandReads},
    {.key = 20, .whole = &KSPParseContext::bandErases},
    {.key = 28, .whole = &KSPParseContext::numSleepOps},
    {.key = 45, .whole = &KSPParseContext::maxHighEnduranceBlockErases},
    {.key = 48, .whole = &KSPParseContext::numFreeVirtualBlocks},
    {.key = 49, .low = &KSPParseContext::bytesPerPage},
    {.key = 50, .low = &KSPParseContext::pagesPerVirtualBlock},
    {.key = 51, .low = &KSPParseContext::blocksPerVirtualBlock},
    {.key = 52, .low = &KSPParseContext::numVirtualBlocks},
    {.key = 53, .low = &KSPParseContext::exportVersion},
    {.key = 56, .whole = &KSPParseContext::utilFormatTime},
};

/// The array statistic that the summary copies.
inline constexpr uint32_t kReadCountHisto = 265;
inline constexpr uint32_t kReadCounts = std::extent_v<decltype(KSPParseContext::readCountHisto)>;

/// Returns the field that copies the single-valued statistic of `key`, or null.
inline const SummaryField* findSummaryField(uint32_t key) {
  return findByKey<kSummaryFields>(key);
}

}  // namespace ksp

#endif
