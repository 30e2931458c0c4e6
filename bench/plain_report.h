#pragma once

#include <endian.h>

#include <cstdint>
#include <cstdio>
#include <cstring>

#include "snapshot/legend.h"

/// The fixed-layout report made the plain way, with one snprintf a piece: what the library's own is compared
/// with and measured beside. Arguments and result are those of KSPParseSnapshotBuffer.
inline int plainReport(const void* records, uint64_t length, char* out, uint64_t* size) {
  struct Column {
    const char* first;
    const char* further;
    size_t word;
  };
  static constexpr Column kColumns[] = {{" RL=%7u", "/%7u", 15},
                                        {" RM=%5u", "/%5u", 16},
                                        {" WO=%4u", "/%4u", 2},
                                        {" WL=%7u", "/%7u", 3},
                                        {" WM=%5u", "/%5u", 4}};
  uint64_t left = *size;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
  const auto piece = [&](const char* format, auto... values) {
    const int written = std::snprintf(out, left, format, values...);
    if (written < 0 || static_cast<uint64_t>(written) >= left) return false;
    out += written;
    left -= static_cast<uint64_t>(written);
    return true;
  };
#pragma GCC diagnostic pop
  if (!piece("%s", ksp::kLegend.data())) return 0;
  for (uint64_t record = 0; record < length / 252; ++record) {
    uint32_t w[63];
    std::memcpy(w, static_cast<const char*>(records) + 252 * record, sizeof w);
    for (uint32_t& word : w) word = le32toh(word);
    if (!piece("T=%04u E=%02u HR=%4u HW=%4u NR=%4u NW=%4u TH=%8u.%02u GC=%4u W=%2u BI=%3u BU=%3u V=%5u "
               "BF=%2u/%2u P=%2u H=%2u/%2u X=%2u/%2u L=%3u/%3u C=%2u/%2u S=%4u U=%8u RO=%4u",
               w[0], w[26], w[27], w[28], w[29], w[30], w[39] / 1000, w[39] % 1000 / 10, w[31], w[33], w[36],
               w[37], w[45], w[47], w[48], w[1], w[41], w[40], w[50], w[51], w[43], w[44], w[53], w[54],
               w[42], w[52], w[14])) {
      return 0;
    }
    for (const size_t word : {17U, 20U, 23U}) {
      if (!piece("/%4u", w[word])) return 0;
    }
    for (const Column& column : kColumns) {
      if (!piece(column.first, w[column.word])) return 0;
      for (const size_t priority : {1U, 2U, 3U}) {
        if (!piece(column.further, w[column.word + 3 * priority])) return 0;
      }
    }
    if (!piece("%s", "\n")) return 0;
  }
  if (!piece("%s", "\n")) return 0;
  *size -= left;
  return 1;
}
