// SPDX-License-Identifier: Apache-2.0
// Pages without a browser: the pictures they are made of, and the numbers of a trend.

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <regex>
#include <string>
#include <vector>

#include "tools/kspdump/series/series.h"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/page/picture.h"

namespace kspdump {
namespace {

constexpr double kMissing = std::numeric_limits<double>::quiet_NaN();

/// What stands between what fits around it, a line each.
std::string linesOf(const std::string& text, const char* pattern) {
  const std::regex each(pattern);
  std::string lines;
  for (std::sregex_iterator at(text.begin(), text.end(), each), end; at != end; ++at) {
    lines += at->format("$1 $2\n");
  }
  return lines;
}

std::string pathsOf(const std::string& svg) {
  return linesOf(svg, "<path class=\"(\\w+)\" d=\"([^\"]*)\"/>");
}

TEST(Picture, BarsStandOnNothing) {
  std::vector<double> many(1000, 0);
  many[500] = 7;
  std::vector<double> opposite(1000, 0);
  opposite[500] = -7;
  opposite[501] = 7;
  const std::pair<std::vector<double>, const char*> cases[] = {
      {{1, 2}, "up M0 24L0 12L63 12L63 24M64 24L64 0L127 0L127 24\n"},
      {{3, -1}, "up M0 18L0 0L63 0L63 18\ndown M64 18L64 24L127 24L127 18\n"},
      {{0, kMissing}, ""},
      // The least bar is seen, and so is one value of many.
      {{1, 1000}, "up M0 24L0 23L63 23L63 24M64 24L64 0L127 0L127 24\n"},
      {many, "up M64 24L64 0L65 0L65 24\n"},
      {opposite, "down M64 12L64 24L65 24L65 12\n"}};
  for (const auto& each : cases) {
    const auto valueAt = [&](size_t at) { return each.first[at]; };
    EXPECT_EQ(pathsOf(drawBars(each.first.size(), valueAt)), each.second);
  }
}

TEST(Picture, LinesLoseNoSpike) {
  EXPECT_EQ(pathsOf(drawLine({0, 1, kMissing, 1})), "line M0 23L43 1M128 1\n");
  EXPECT_EQ(pathsOf(drawLine({5, 5})), "line M0 12L128 12\n");
  EXPECT_EQ(pathsOf(drawLine({5})), "line M0 12\n");
  std::vector<double> each(128, 1);
  each[50] = 2;
  EXPECT_NE(pathsOf(drawLine(each)).find("L49 23L50 1L51 23"), std::string::npos) << "not a point a value";
  std::vector<double> many(10000, 1);
  many[5010] = 9;
  many[7000] = -7;
  many[0] = many[5000] = many[7001] = kMissing;
  const std::string path = pathsOf(drawLine(many));
  EXPECT_NE(path.find("L64 1L"), path.npos) << path;
  EXPECT_NE(path.find("L90 23"), path.npos) << path;
  EXPECT_TRUE(path.ends_with("L126 12\n")) << path << "is not of 64 columns";
}

TEST(Page, ATrendHasItsExtremes) {
  Series series;
  for (const uint64_t value : {1000U, 500U, 12345678U, 0U, 1235567U}) {
    unsigned char bytes[sizeof value];
    for (unsigned i = 0; i < sizeof bytes; ++i) bytes[i] = static_cast<unsigned char>(value >> (8 * i));
    const Record record = {0, 4, false, false, "a", Values(bytes, 1, sizeof bytes, 8)};
    series.begin({});
    if (value != 0) series.records({&record, 1});
    series.end({});
  }
  Sink sink;
  makeHtml({}, sink)->trend(series);
  EXPECT_NE(sink.text.find("[1000,500,12345678,null,1235567]"), std::string::npos);
  const std::string numbers = linesOf(sink.text, "<td class=\"number[^\"]*\">([^\n]*?)</td>");
  EXPECT_TRUE(
      numbers.ends_with("\n4 \n1<i>000</i> \n1<i>235</i><i>567</i> \n500 \n12<i>345</i><i>678</i> "
                        "\n+1<i>234</i><i>567</i> \n+123<i>456</i>.7 \n"))
      << numbers;
}

}  // namespace
}  // namespace kspdump
