// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "numbers/format.h"

namespace ksp {

inline constexpr uint64_t kRecordBytes = 252;
inline constexpr size_t kPriorities = 4;

// Words of a record that are not just numbers with a label.
inline constexpr size_t kWriteTriples = 2;
inline constexpr size_t kReadTriples = 14;
inline constexpr size_t kHysteresis = 39;

/// A word of a record, and how the report shows it.
struct RecordField {
  NumberFormat format;
  size_t word;
};

inline constexpr RecordField kBeforeHysteresis[] = {
    {"T=%04u", 0}, {" E=%02u", 26}, {" HR=%4u", 27}, {" HW=%4u", 28}, {" NR=%4u", 29}, {" NW=%4u", 30},
};

inline constexpr RecordField kAfterHysteresis[] = {
    {" GC=%4u", 31}, {" W=%2u", 33}, {" BI=%3u", 36}, {" BU=%3u", 37}, {" V=%5u", 45}, {" BF=%2u", 47},
    {"/%2u", 48},    {" P=%2u", 1},  {" H=%2u", 41},  {"/%2u", 40},    {" X=%2u", 50}, {"/%2u", 51},
    {" L=%3u", 43},  {"/%3u", 44},   {" C=%2u", 53},  {"/%2u", 54},    {" S=%4u", 42}, {" U=%8u", 52},
};

}  // namespace ksp
