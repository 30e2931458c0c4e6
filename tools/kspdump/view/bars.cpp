// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/bars.h"

#include <algorithm>
#include <cmath>
#include <iterator>

namespace kspdump {

const char* bar(size_t level) {
  static constexpr const char* kBlocks[] = {"·", "▁", "▂", "▃", "▄", "▅", "▆", "▇", "█"};
  static constexpr const char* kAscii[] = {"_", ".", ":", "-", "=", "+", "*", "#", "@"};
  return (localeIsUtf8() ? kBlocks : kAscii)[level];
}

void appendChanges(std::string& out, std::span<const Wide> changes, size_t width) {
  static constexpr const char* kFalls[] = {"▔", "▀"};
  static constexpr const char* kAsciiFalls[] = {"v", "V"};
  const auto& falls = localeIsUtf8() ? kFalls : kAsciiFalls;
  const auto isLess = [](const Wide& a, const Wide& b) { return a.magnitude() < b.magnitude(); };
  if (changes.empty()) return;
  const Wide largest = std::max_element(changes.begin(), changes.end(), isLess)->magnitude();
  const size_t bars = std::min(changes.size(), width);
  for (size_t i = 0; i < bars; ++i) {
    const Wide change = *std::max_element(
        changes.begin() + static_cast<std::ptrdiff_t>(i * changes.size() / bars),
        changes.begin() + static_cast<std::ptrdiff_t>((i + 1) * changes.size() / bars), isLess);
    if (change.isNegative()) {
      out += falls[change.magnitude() * 2 > largest ? 1 : 0];
    } else {
      out += bar(levelOf(change, largest));
    }
  }
}

void appendSparkline(std::string& out, std::span<const std::optional<double>> values, size_t width) {
  const size_t bars = std::min(values.size(), width);
  double largest = 0;
  for (const auto& value : values) largest = std::max(largest, value.value_or(0));
  for (size_t i = 0; i < bars; ++i) {
    std::optional<double> greatest;
    for (size_t at = i * values.size() / bars; at < (i + 1) * values.size() / bars; ++at) {
      if (values[at]) greatest = std::max(greatest.value_or(0), *values[at]);
    }
    if (!greatest) {
      out += ' ';
    } else if (*greatest == 0) {
      out += bar(0);
    } else {
      out += bar(std::clamp<size_t>(static_cast<size_t>(std::ceil(*greatest / largest * kBarLevels)), 1,
                                    kBarLevels));
    }
  }
}

void appendBar(std::string& out, uint64_t value, uint64_t largest, size_t width) {
  static constexpr const char* kParts[] = {"", "▏", "▎", "▍", "▌", "▋", "▊", "▉"};
  constexpr size_t kEighths = std::size(kParts);
  if (value == 0) return;
  const double columns =
      static_cast<double>(value) / static_cast<double>(largest) * static_cast<double>(width);
  // Whatever is there is seen.
  const auto eighths = std::max<size_t>(1, static_cast<size_t>(columns * kEighths));
  if (localeIsUtf8()) {
    for (size_t i = 0; i < eighths / kEighths; ++i) out += "█";
    out += kParts[eighths % kEighths];
  } else {
    out.append(std::max<size_t>(1, eighths / kEighths), '#');
  }
}

}  // namespace kspdump
