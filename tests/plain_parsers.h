// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <endian.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <iterator>
#include <limits>
#include <utility>
#include <vector>

#include "ksp/context.h"
#include "ksp/detail/msp_keys.hpp"
#include "ksp/detail/stats_keys.hpp"

/// The parsers made the plain way, names by snprintf: what the library's own are compared with and measured
/// beside. Of the library they use the key tables alone.
///
/// Each takes a context, of which only the summary is written, the stream and its bytes, and an
/// `append(prefix, name, value)` that never fails; the result is that of the library's parser.
namespace ksp::test {

inline uint64_t plainNumber(const unsigned char* bytes, size_t width) {
  uint64_t number = 0;
  std::memcpy(&number, bytes, width);
  return le64toh(number);
}

/// Returns the key table's row of `key`, or null.
template <const auto& rows>
auto plainRow(size_t key) -> decltype(std::data(rows)) {
  static const auto kByKey = [] {
    std::vector<decltype(std::data(rows))> byKey(std::numeric_limits<uint16_t>::max() + 1);
    for (const auto& row : rows) byKey[row.key] = &row;
    return byKey;
  }();
  return key < kByKey.size() ? kByKey[key] : nullptr;
}

template <class Append>
void plainElements(const char* name, const unsigned char* source, size_t width, size_t count, Append append) {
  if (count == 1) return append(name, "", plainNumber(source, width));
  for (size_t i = 0; i < count; ++i) {
    char index[24];
    static_cast<void>(std::snprintf(index, sizeof index, "%zu", i));
    append(name, index, plainNumber(source + i * width, width));
  }
}

template <class Append>
uint32_t plainStatistics(const unsigned char* stream, uint32_t length, bool byNumber, Append append) {
  uint32_t total = 0;
  for (size_t left = length / 8; left > 0;) {
    const auto key = static_cast<size_t>(plainNumber(stream, 4));
    const auto count = static_cast<size_t>(plainNumber(stream + 4, 4));
    stream += 8;
    --left;
    if (count == 0) continue;
    if (key == 0xFFFF || key > 0x30000000 || count > left) break;
    const auto* const row = byNumber ? nullptr : plainRow<kStatsKeys>(key);
    const size_t used = row == nullptr ? count : std::min<size_t>(row->count, count);
    if (used > 65535) break;
    char name[KSPNodeTextSize];
    if (row == nullptr) {
      static_cast<void>(
          std::snprintf(name, sizeof name, "Stat_%d%s", static_cast<int>(key), count > 1 ? "_" : ""));
    } else {
      static_cast<void>(
          std::snprintf(name, sizeof name, "%s%s", row->name.data(), row->count > 1 ? "_" : ""));
    }
    plainElements(name, stream, 8, used, append);
    total += static_cast<uint32_t>(used);
    stream += 8 * count;
    left -= count;
  }
  return total;
}

inline constexpr auto plainGeneric = [](auto&, const unsigned char* stream, uint32_t length, auto append) {
  return plainStatistics(stream, length, false, append);
};

inline constexpr auto plainStatKey = [](auto&, const unsigned char* stream, uint32_t length, auto append) {
  return plainStatistics(stream, length, true, append);
};

/// Keys of the summary's fields, and where these lie behind its first: four bytes in front of the 32nd, then
/// eight.
inline constexpr std::pair<uint64_t, size_t> kPlainSummary[] = {
    {53, 0},  {52, 12}, {51, 16}, {50, 20},  {49, 24},  {7, 32},   {4, 40},   {48, 48}, {17, 56},
    {19, 64}, {18, 72}, {20, 80}, {12, 112}, {13, 120}, {56, 128}, {28, 136}, {45, 144}};

inline void plainSummary(KSPParseContext& context, uint64_t key, const unsigned char* values, size_t count) {
  const uint64_t value = plainNumber(values, 8);
  const auto low = static_cast<uint32_t>(value);
  for (const auto& [of, offset] : kPlainSummary) {
    char* const field = reinterpret_cast<char*>(&context) + offsetof(KSPParseContext, exportVersion) + offset;
    if (of == key && offset < 32) std::memcpy(field, &low, sizeof low);
    if (of == key && offset >= 32) std::memcpy(field, &value, sizeof value);
  }
  for (size_t i = 0; key == 265 && i < std::min<size_t>(count, 5); ++i) {
    context.readCountHisto[i] = plainNumber(values + 8 * i, 8);
  }
}

inline constexpr auto plainLegacy = [](KSPParseContext& context, const unsigned char* stream, uint32_t length,
                                       auto append) {
  context.parseMarker = 0xFFFFFFFF;
  if (length < 8) return 0;
  for (size_t left = length / 8; left > 0;) {
    const auto key = static_cast<size_t>(plainNumber(stream, 4));
    const auto count = static_cast<size_t>(plainNumber(stream + 4, 4));
    stream += 8;
    --left;
    if (key > 0x30000000 || count > left) {
      context.exportVersion = 0;
      return 0;
    }
    const auto* const row = plainRow<kStatsKeys>(key);
    if (row != nullptr && count > 0) {
      plainSummary(context, key, stream, count);
      plainElements(row->name.data(), stream, 8, std::min<size_t>(row->count, count), append);
    }
    stream += 8 * count;
    left -= count;
  }
  return 1;
};

inline constexpr auto plainMedia = [](auto&, const unsigned char* buffer, uint32_t length, auto append) {
  uint32_t total = 0;
  while (length >= 4) {
    const auto key = static_cast<size_t>(plainNumber(buffer, 2));
    const auto size = static_cast<uint32_t>(plainNumber(buffer + 2, 2));
    buffer += 4;
    length -= 4;
    if (size == 0) continue;
    if (key == 12287 || size > length) break;
    if (const auto* const row = plainRow<mspKeyTable>(key)) {
      const uint32_t count = std::min<uint32_t>(size / row->width, row->count);
      plainElements(row->name.data(), buffer, row->width, count, append);
      total += count;
    }
    buffer += size;
    length -= size;
  }
  return total;
};

}  // namespace ksp::test
