// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/bars.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <iterator>

#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

/// Heights above nothing that a picture's bars have.
constexpr size_t kLevels = 8;

/// A character of a picture, copied at a constant size.
struct Glyph {
  char text[sizeof(uint32_t)];
  uint8_t size;
};

template <size_t size>
constexpr Glyph glyph(const char (&literal)[size]) {
  Glyph made = {};
  std::copy_n(literal, size - 1, made.text);
  made.size = size - 1;
  return made;
}

/// The picture of each height, nothing's first.
const Glyph* bars() {
  static constexpr Glyph kBlocks[] = {glyph("·"), glyph("▁"), glyph("▂"), glyph("▃"), glyph("▄"),
                                      glyph("▅"), glyph("▆"), glyph("▇"), glyph("█")};
  static constexpr Glyph kAscii[] = {glyph("_"), glyph("."), glyph(":"), glyph("-"), glyph("="),
                                     glyph("+"), glyph("*"), glyph("#"), glyph("@")};
  return localeIsUtf8() ? kBlocks : kAscii;
}

/// A picture at the end of a text, of at most so many columns.
class Picture {
 public:
  Picture(std::string& out, size_t columns) : out_(out), size_(out.size()) {
    out_.resize(size_ + columns * sizeof Glyph::text);
  }
  Picture(const Picture&) = delete;
  Picture& operator=(const Picture&) = delete;
  ~Picture() { out_.resize(size_); }

  void add(const Glyph& next) {
    std::memcpy(out_.data() + size_, next.text, sizeof next.text);
    size_ += next.size;
  }

 private:
  std::string& out_;
  size_t size_;
};

/// How high a value's bar is beside the largest's. Whatever is there is seen.
class Scale {
 public:
  explicit Scale(uint64_t largest) {
    for (size_t level = 0; level < kLevels; ++level) {
      most_[level] = largest / kLevels * level + largest % kLevels * level / kLevels;
    }
  }

  [[nodiscard]] size_t levelOf(uint64_t value) const {
    // How many of them are smaller: no processor foresees which.
    size_t level = value > most_[kLevels / 2 - 1] ? kLevels / 2 : 0;
    level += value > most_[level + kLevels / 4 - 1] ? kLevels / 4 : 0;
    level += value > most_[level] ? 1 : 0;
    return level + (value > most_[level] ? 1 : 0);
  }

 private:
  /// The greatest value that has at most this height.
  uint64_t most_[kLevels];
};

/// Where there are more values than columns, the first of a column's share; each column shows the greatest of
/// its.
size_t shareOf(uint64_t column, size_t columns, size_t values) {
  return static_cast<size_t>(column * values / columns);
}

}  // namespace

void appendBars(std::string& out, const Values& values, size_t width) {
  const auto largestOf = [&](size_t first, size_t last) {
    uint64_t largest = 0;
    values.forEach(static_cast<uint32_t>(first), static_cast<uint32_t>(last),
                   [&](uint64_t value) { largest = std::max(largest, value); });
    return largest;
  };
  const Scale scale(largestOf(0, values.size()));
  const Glyph* const glyphs = bars();
  const size_t columns = std::min<size_t>(values.size(), width);
  Picture picture(out, columns);
  if (columns == values.size()) {
    values.forEach(0, values.size(), [&](uint64_t value) { picture.add(glyphs[scale.levelOf(value)]); });
    return;
  }
  for (size_t i = 0; i < columns; ++i) {
    const uint64_t value =
        largestOf(shareOf(i, columns, values.size()), shareOf(i + 1, columns, values.size()));
    picture.add(glyphs[scale.levelOf(value)]);
  }
}

void appendChanges(std::string& out, std::span<const Wide> changes, size_t width) {
  static constexpr Glyph kFalls[] = {glyph("▔"), glyph("▀")};
  static constexpr Glyph kAsciiFalls[] = {glyph("v"), glyph("V")};
  const auto& falls = localeIsUtf8() ? kFalls : kAsciiFalls;
  const auto isLess = [](const Wide& a, const Wide& b) { return a.magnitude() < b.magnitude(); };
  const auto largestOf = [&](size_t first, size_t last) {
    const auto at = [&](size_t i) { return changes.begin() + static_cast<std::ptrdiff_t>(i); };
    return *std::max_element(at(first), at(last), isLess);
  };
  if (changes.empty()) return;
  const uint64_t largest = largestOf(0, changes.size()).magnitude().low();
  const Scale scale(largest);
  const size_t columns = std::min(changes.size(), width);
  Picture picture(out, columns);
  for (size_t i = 0; i < columns; ++i) {
    const Wide change =
        largestOf(shareOf(i, columns, changes.size()), shareOf(i + 1, columns, changes.size()));
    const uint64_t height = change.magnitude().low();
    if (change.isNegative()) {
      picture.add(falls[height > largest / 2 ? 1 : 0]);
    } else {
      picture.add(bars()[scale.levelOf(height)]);
    }
  }
}

void appendSparkline(std::string& out, std::span<const std::optional<double>> values, size_t width) {
  static constexpr Glyph kBlank = glyph(" ");
  double largest = 0;
  for (const auto& value : values) largest = std::max(largest, value.value_or(0));
  const size_t columns = std::min(values.size(), width);
  Picture picture(out, columns);
  for (size_t i = 0; i < columns; ++i) {
    std::optional<double> greatest;
    for (size_t at = shareOf(i, columns, values.size()); at < shareOf(i + 1, columns, values.size()); ++at) {
      if (values[at]) greatest = std::max(greatest.value_or(0), *values[at]);
    }
    if (!greatest) {
      picture.add(kBlank);
    } else if (*greatest == 0) {
      picture.add(bars()[0]);
    } else {
      const auto level = static_cast<size_t>(std::ceil(*greatest / largest * static_cast<double>(kLevels)));
      picture.add(bars()[std::clamp<size_t>(level, 1, kLevels)]);
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
