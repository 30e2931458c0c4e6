// SPDX-License-Identifier: Apache-2.0
#include "snapshot/field_format.h"

#include <algorithm>
#include <cstddef>

namespace ksp {

namespace {

constexpr std::string_view kFlags = "-+ #0";
constexpr std::string_view kDigits = "0123456789";
constexpr size_t kMostWidthDigits = 3;

// What a field of one type hands to its format.
struct Supply {
  size_t values;
  std::string_view conversions;
};

Supply supplyOf(uint16_t type) {
  constexpr std::string_view kUnsigned = "diuxXo";
  switch (type) {
    case kFieldNumber:
    case kFieldOtherNumber:
      return {1, kUnsigned};
    case kFieldThousandths:
      return {2, kUnsigned};
    case kFieldTriples:
      return {1, "s"};
    default:
      return {0, ""};
  }
}

size_t skip(std::string_view& text, std::string_view characters) {
  const size_t count = std::min(text.find_first_not_of(characters), text.size());
  text.remove_prefix(count);
  return count;
}

}  // namespace

bool formatIsSafe(const FieldDescriptor& descriptor) {
  std::string_view rest(descriptor.format, FieldDescriptor::kFormatBytes);
  const size_t end = rest.find('\0');
  if (end == std::string_view::npos) return false;
  rest = rest.substr(0, end);

  Supply supply = supplyOf(descriptor.type);
  for (size_t percent = rest.find('%'); percent != std::string_view::npos; percent = rest.find('%')) {
    rest.remove_prefix(percent + 1);
    if (rest.starts_with('%')) {
      rest.remove_prefix(1);
      continue;
    }
    skip(rest, kFlags);
    if (skip(rest, kDigits) > kMostWidthDigits) return false;
    if (rest.starts_with('.')) {
      rest.remove_prefix(1);
      if (skip(rest, kDigits) > kMostWidthDigits) return false;
    }
    if (rest.empty() || supply.values == 0 || supply.conversions.find(rest[0]) == std::string_view::npos) {
      return false;
    }
    rest.remove_prefix(1);
    --supply.values;
  }
  return true;
}

}  // namespace ksp
