// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <string_view>
#include <tuple>

#include "tests/plain_parsers.h"

/// The snapshot renderers made the plain way, with one snprintf a piece: what the library's own are compared
/// with and measured beside.
namespace ksp::test {

inline constexpr char kPlainLegend[] =
#include "tests/data/legend.inc"
    ;

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
#pragma GCC diagnostic ignored "-Wformat-security"

/// Arguments and result are those of KSPParseSnapshotBuffer.
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
  auto left = static_cast<size_t>(*size);
  const auto piece = [&](const char* format, auto... values) {
    const int written = std::snprintf(out, left, format, values...);
    if (written < 0 || static_cast<size_t>(written) >= left) return false;
    out += written;
    left -= static_cast<size_t>(written);
    return true;
  };
  if (!piece("%s", kPlainLegend)) return 0;
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

/// Whether a field of `type` may be printed with `format`, 16 bytes: it supplies every conversion.
inline bool plainFormatIsSafe(uint64_t type, const char* format) {
  if (std::memchr(format, '\0', 16) == nullptr) return false;
  const auto digits = [&] { return std::strspn(format, "0123456789"); };
  int supplied = type == 2 ? 2 : 1;
  while ((format = std::strchr(format, '%')) != nullptr) {
    if (*++format != '%') {
      format += std::strspn(format, "-+ #0");
      if (digits() > 3) return false;
      format += digits();
      if (*format == '.' && (++format, digits() > 3)) return false;
      format += digits();
      if (*format == '\0' || std::strchr(type == 3 ? "s" : "diuxXo", *format) == nullptr) return false;
      if (supplied-- == 0) return false;
    }
    ++format;
  }
  return true;
}

/// What a call of KSPParseSnapshotBufferWithInplaceParser returns and leaves.
struct PlainPage {
  int result;
  uint32_t cursor;
  std::string text;
};

/// The page of that call, with `captureLine` at its beginning.
inline PlainPage plainPage(const unsigned char* records, uint64_t length, uint64_t capacity,
                           const unsigned char* header, uint32_t cursor, std::string_view captureLine) {
  const auto word = [](const unsigned char* at) { return static_cast<uint32_t>(plainNumber(at, 4)); };
  const auto print = [](const char* format, auto... values) {
    char text[4096];
    return std::string(text, static_cast<size_t>(std::snprintf(text, sizeof text, format, values...)));
  };
  const uint32_t recordSize = word(header + 8);
  const uint32_t recordCount = word(header + 12);
  const unsigned char* const table = header + word(header + 24);
  const auto lies = [&](const unsigned char* descriptor, uint64_t size) {
    return word(descriptor + 4) + size <= recordSize;
  };
  const auto bytesOf = [&](const unsigned char* descriptor) {
    return plainNumber(descriptor, 2) == 3 ? word(descriptor + 8) : 4;
  };

  std::string text(captureLine);
  if (cursor == 0 && word(header + 4) < 6) text += kPlainLegend;
  if (cursor == 0 && word(header + 4) >= 6) {
    text += print("- KSP Snapshot - \n%.4000s\n", reinterpret_cast<const char*>(header + 36));
  }
  PlainPage page = {0, cursor, ""};
  if (text.size() >= capacity) return page;
  uint64_t end = recordCount == 0 ? 0 : recordCount - 1;
  if (recordSize != 0) end = std::min(end, length / recordSize);
  const bool hasKey = word(table) > 0 && lies(table + 8, bytesOf(table + 8)) && lies(table + 8, 4);
  if (!hasKey) page.cursor = static_cast<uint32_t>(std::max<uint64_t>(cursor, end));
  while (page.cursor < end) {
    const unsigned char* const record = records + uint32_t{page.cursor++ * recordSize};
    if (word(record + word(table + 12)) == 0) continue;
    for (uint32_t i = 0; i < word(table); ++i) {
      const unsigned char* const descriptor = table + 8 + 28 * size_t{i};
      const uint64_t type = plainNumber(descriptor, 2);
      const unsigned char* const field = record + word(descriptor + 4);
      const auto* const format = reinterpret_cast<const char*>(descriptor + 12);
      if (!lies(descriptor, bytesOf(descriptor)) || !plainFormatIsSafe(type, format)) continue;
      if (type < 2) text += print(format, word(field));
      if (type == 2) text += print(format, word(field) / 1000, word(field) % 1000 / 10);
      if (type != 3) continue;
      for (const auto& [letter, numbers, offset] :
           {std::tuple{"O", "/%4u", 0U}, {"L", "/%7u", 4U}, {"M", "/%5u", 8U}}) {
        text += print(format, letter);
        for (uint32_t k = 0; k < word(descriptor + 8) / 12; ++k) {
          text += print(k == 0 ? numbers + 1 : numbers, word(field + 12 * size_t{k} + offset));
        }
      }
    }
    text += '\n';
    if (text.size() >= capacity) return page;
    page.text = text;
  }
  page.result = 1;
  return page;
}

#pragma GCC diagnostic pop

}  // namespace ksp::test
