// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/page/picture.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <limits>
#include <string_view>

namespace kspdump {

namespace {

/// Pictures are drawn in a field of `kWidth` by `kHeight`.
constexpr int kWidth = 128;
constexpr int kHeight = 24;

void appendPoint(std::string& path, char command, double x, double y) {
  char text[64];
  char* at = text;
  *at++ = command;
  at = std::to_chars(at, std::end(text), static_cast<int>(std::lround(x))).ptr;
  *at++ = ' ';
  at = std::to_chars(at, std::end(text), static_cast<int>(std::lround(y * 4)) / 4.0).ptr;
  path.append(text, at);
}

std::string picture(std::string_view paths) {
  return "<svg viewBox=\"0 0 " + std::to_string(kWidth) + " " + std::to_string(kHeight) +
         "\" preserveAspectRatio=\"none\" aria-hidden=\"true\">" + std::string(paths) + "</svg>";
}

}  // namespace

std::string drawBars(size_t count, const std::function<double(size_t)>& valueAt) {
  constexpr size_t kMostBars = 64;
  double greatest = 0;
  double least = 0;
  for (size_t at = 0; at < count; ++at) {
    const double value = valueAt(at);
    greatest = std::max(greatest, value);
    least = std::min(least, value);
  }
  const double range = greatest - least;
  const double base = kHeight * greatest / range;
  const size_t bars = std::min(count, kMostBars);
  const double step = static_cast<double>(kWidth) / static_cast<double>(bars);
  std::string up;
  std::string down;
  for (size_t bar = 0; bar < bars; ++bar) {
    // Where there are more values than bars, a bar shows the one farthest from nothing.
    double value = 0;
    for (size_t at = bar * count / bars; at < (bar + 1) * count / bars; ++at) {
      const double each = valueAt(at);
      if (std::abs(each) > std::abs(value)) value = each;
    }
    if (value == 0) continue;
    const bool falls = value < 0;
    std::string& path = falls ? down : up;
    // What is there at all is seen.
    const double height = std::max(std::abs(value) * kHeight / range, 1.0);
    const double tip = falls ? base + height : base - height;
    const double left = static_cast<double>(bar) * step;
    const double right = left + std::max(step - 1, 1.0);
    appendPoint(path, 'M', left, base);
    appendPoint(path, 'L', left, tip);
    appendPoint(path, 'L', right, tip);
    appendPoint(path, 'L', right, base);
  }
  std::string paths;
  if (!up.empty()) paths += "<path class=\"up\" d=\"" + up + "\"/>";
  if (!down.empty()) paths += "<path class=\"down\" d=\"" + down + "\"/>";
  return picture(paths);
}

std::string drawLine(const std::vector<double>& values) {
  constexpr size_t kMostColumns = kWidth / 2;
  double least = std::numeric_limits<double>::infinity();
  double greatest = -least;
  for (const double value : values) {
    // These pass over values that are missing.
    least = std::fmin(least, value);
    greatest = std::fmax(greatest, value);
  }
  std::string path;
  bool isDrawing = false;
  const double span = std::max(static_cast<double>(values.size()) - 1, 1.0);
  const auto add = [&](size_t at) {
    if (std::isnan(values[at])) {
      isDrawing = false;
      return;
    }
    const double height = greatest > least ? (values[at] - least) / (greatest - least) : 0.5;
    appendPoint(path, isDrawing ? 'L' : 'M', static_cast<double>(at) * kWidth / span,
                1 + (kHeight - 2) * (1 - height));
    isDrawing = true;
  };
  if (values.size() <= 2 * kMostColumns) {
    for (size_t at = 0; at < values.size(); ++at) add(at);
  } else {
    for (size_t column = 0; column < kMostColumns; ++column) {
      const size_t first = column * values.size() / kMostColumns;
      const size_t last = (column + 1) * values.size() / kMostColumns;
      size_t low = first;
      size_t high = first;
      for (size_t at = first; at < last; ++at) {
        if (std::isnan(values[low]) || values[at] < values[low]) low = at;
        if (std::isnan(values[high]) || values[at] > values[high]) high = at;
      }
      add(std::min(low, high));
      if (low != high) add(std::max(low, high));
    }
  }
  return picture("<path class=\"line\" d=\"" + path + "\"/>");
}

}  // namespace kspdump
