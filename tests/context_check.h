// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "ksp/entries.hpp"

namespace ksp::test {

inline GenericParserContext& listsOf(GenericParserContext& context) {
  return context;
}
inline GenericParserContext& listsOf(KSPParseContext& context) {
  return context.entries;
}

inline void require(bool holds) {
  if (!holds) std::abort();
}

inline void requireText(const NameValueNode& node) {
  const std::string_view all(node.text, KSPNodeTextSize);
  const size_t length = all.find('\0');
  require(length <= KSPNodeTextSize - 2 && all.find_first_not_of('\0', length) == std::string_view::npos);
}

/// Ends the process unless the context is sound; returns the number of its entries.
inline uint32_t requireSound(const GenericParserContext& context) {
  uint32_t count = 0;
  const NameValueNode* lastName = nullptr;
  const NameValueNode* lastValue = nullptr;
  const NameValueNode* value = context.valueHead;
  for (const NameValueNode* name = context.nameHead; name != nullptr; name = name->next) {
    require(value != nullptr && name->value == 0);
    requireText(*name);
    requireText(*value);
    require(value->text == std::to_string(value->value));
    lastName = name;
    lastValue = value;
    value = value->next;
    ++count;
  }
  require(value == nullptr && context.nameTail == lastName && context.valueTail == lastValue);
  return count;
}

inline bool sameSummary(const GenericParserContext&, const GenericParserContext&) {
  return true;
}
inline bool sameSummary(const KSPParseContext& one, const KSPParseContext& other) {
  const auto same = [&](size_t from, size_t to) {
    return std::memcmp(reinterpret_cast<const char*>(&one) + from,
                       reinterpret_cast<const char*>(&other) + from, to - from) == 0;
  };
  // Nothing says what lies between the words and the double words.
  constexpr size_t kWordsEnd = offsetof(KSPParseContext, bytesPerPage) + sizeof one.bytesPerPage;
  return same(sizeof one.entries, kWordsEnd) && same(offsetof(KSPParseContext, hostReads), sizeof one);
}

/// Parses a stream twice into one context, the second time from an odd address, and tells whether result,
/// entries and summary are those of the plain parser.
template <class Owner, class Parse, class Plain>
bool agrees(Parse parse, Plain plain, const unsigned char* stream, uint32_t length) {
  std::vector<unsigned char> odd(size_t{length} + 1);
  std::copy_n(stream, length, odd.begin() + 1);
  Owner found;
  const auto first = parse(found.get(), stream, length);
  const auto second = parse(found.get(), odd.data() + 1, length);
  requireSound(listsOf(*found.get()));

  std::remove_pointer_t<decltype(found.get())> expected{};
  auto entry = entries(found).begin();
  bool same = true;
  const auto append = [&](std::string_view prefix, std::string_view name, uint64_t value) {
    same = same && entry != std::default_sentinel && (*entry).value == value &&
           (*entry).name.starts_with(prefix) && (*entry).name.substr(prefix.size()) == name;
    if (same) ++entry;
  };
  same = plain(expected, stream, length, append) == first && same;
  same = plain(expected, stream, length, append) == second && same;
  return same && entry == std::default_sentinel && sameSummary(*found, expected);
}

}  // namespace ksp::test
