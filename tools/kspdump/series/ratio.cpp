// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/series/ratio.h"

#include <algorithm>

namespace kspdump {

namespace {

/// More than any controller has; longer arrays are no priorities.
constexpr uint32_t kMostPriorities = 64;

std::optional<size_t> trackNamed(const Series& series, const std::string& name, bool isArray) {
  const std::vector<Track>& tracks = series.tracks();
  const auto at = std::find_if(tracks.begin(), tracks.end(), [&](const Track& each) {
    return each.name == name && each.isArray == isArray;
  });
  if (at == tracks.end()) return std::nullopt;
  return static_cast<size_t>(at - tracks.begin());
}

std::optional<double> divided(const Wide& dividend, const Wide& divisor) {
  if (divisor == Wide()) return std::nullopt;
  return static_cast<double>(dividend) / static_cast<double>(divisor);
}

}  // namespace

std::vector<Ratio> ratiosOf(const Series& series) {
  std::vector<Ratio> ratios;
  const auto media = trackNamed(series, "NW", false);
  const auto host = trackNamed(series, "HW", false);
  if (media && host) ratios.push_back({"NW/HW", *media, *host, 0});
  const std::vector<Track>& tracks = series.tracks();
  for (size_t latency = 0; latency < tracks.size(); ++latency) {
    // The columns of a direction's priorities: the direction and "O", "L" or "M".
    const Track& of = tracks[latency];
    if (!of.isArray || !of.name.ends_with('L')) continue;
    const std::string operationsName = of.name.substr(0, of.name.size() - 1) + "O";
    const auto operations = trackNamed(series, operationsName, true);
    if (!operations) continue;
    const uint32_t elements = std::min(of.elements, tracks[*operations].elements);
    if (elements > kMostPriorities) continue;
    for (uint32_t i = 0; i < elements; ++i) {
      ratios.push_back({of.name + "/" + operationsName + "_" + std::to_string(i), latency, *operations, i});
    }
  }
  return ratios;
}

std::optional<double> ratioAt(const Series& series, const Ratio& ratio, size_t point) {
  return divided(series.values(ratio.dividend, point)[ratio.element],
                 series.values(ratio.divisor, point)[ratio.element]);
}

std::optional<double> ratioOverall(const Series& series, const Ratio& ratio) {
  Wide dividends;
  Wide divisors;
  for (size_t point = 0; point < series.points(); ++point) {
    dividends += series.values(ratio.dividend, point)[ratio.element];
    divisors += series.values(ratio.divisor, point)[ratio.element];
  }
  return divided(dividends, divisors);
}

}  // namespace kspdump
