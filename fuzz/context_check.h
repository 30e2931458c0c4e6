#pragma once

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "ksp/entries.hpp"

namespace ksp {

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

/// Parses the input twice into one context, the second time from an odd address, and requires both to do the
/// same. `check` gets the result and the number of entries that the call appended.
template <class Context, class Parse, class Check>
int parseTwice(Context& context, const GenericParserContext& entries, Parse parse, const uint8_t* data,
               size_t size, Check check) {
  const auto length = static_cast<uint32_t>(size);
  const auto result = parse(context.get(), data, length);
  const uint32_t count = requireSound(entries);
  check(result, count);
  std::vector<uint8_t> odd(size + 1);
  std::copy_n(data, size, odd.begin() + 1);
  require(parse(context.get(), odd.data() + 1, length) == result);
  require(requireSound(entries) == 2 * count);
  return 0;
}

/// For the parsers whose result is the number of values that they appended.
template <class Parse>
int checkCounting(Parse parse, const uint8_t* data, size_t size) {
  GenericContext context;
  return parseTwice(context, *context, parse, data, size,
                    [](uint32_t result, uint32_t count) { require(result == count); });
}

}  // namespace ksp
