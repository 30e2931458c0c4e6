// Pages without a browser: the parts they are made of, and the data that they carry.

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <nlohmann/json.hpp>
#include <regex>
#include <stdexcept>
#include <string>
#include <vector>

#include "tools/kspdump/series/series.h"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/page/page.h"
#include "tools/kspdump/view/page/picture.h"

namespace kspdump {
namespace {

using nlohmann::json;

constexpr double kMissing = std::numeric_limits<double>::quiet_NaN();

std::vector<std::string> pathsOf(const std::string& svg) {
  static const std::regex kPath("<path class=\"(\\w+)\" d=\"([^\"]*)\"/>");
  std::vector<std::string> paths;
  for (std::sregex_iterator at(svg.begin(), svg.end(), kPath), end; at != end; ++at) {
    paths.push_back((*at)[1].str() + ": " + (*at)[2].str());
  }
  return paths;
}

using Paths = std::vector<std::string>;

TEST(Picture, BarsStandOnNothing) {
  EXPECT_EQ(pathsOf(drawBars({1, 2})), Paths({"up: M0 24L0 12L63 12L63 24M64 24L64 0L127 0L127 24"}));
  EXPECT_EQ(pathsOf(drawBars({3, -1})),
            Paths({"up: M0 18L0 0L63 0L63 18", "down: M64 18L64 24L127 24L127 18"}));
  EXPECT_EQ(pathsOf(drawBars({0, kMissing})), Paths());
  // The least bar is seen, and so is one value of many.
  EXPECT_EQ(pathsOf(drawBars({1, 1000})), Paths({"up: M0 24L0 23L63 23L63 24M64 24L64 0L127 0L127 24"}));
  std::vector<double> many(1000, 0);
  many[999] = 7;
  EXPECT_EQ(pathsOf(drawBars(many)), Paths({"up: M126 24L126 0L127 0L127 24"}));
}

TEST(Picture, LinesLoseNoSpike) {
  EXPECT_EQ(pathsOf(drawLine({0, 1, kMissing, 1})), Paths({"line: M0 23L43 1M128 1"}));
  EXPECT_EQ(pathsOf(drawLine({5, 5})), Paths({"line: M0 12L128 12"}));
  std::vector<double> many(10000, 1);
  many[5000] = 9;
  many[7000] = -7;
  many[0] = many[5001] = many[7001] = kMissing;
  const std::string path = pathsOf(drawLine(many)).at(0);
  EXPECT_NE(path.find("L64 1L"), path.npos) << path;
  EXPECT_NE(path.find("L90 23"), path.npos) << path;
  EXPECT_LT(path.size(), 2000u);
}

TEST(Page, TextsAreNeverMarkup) {
  std::string out;
  appendHtml(out, "<a href='x' title=\"y\">&amp;\x1b\xff");
  EXPECT_EQ(out, "&lt;a href=&#39;x&#39; title=&quot;y&quot;&gt;&amp;amp;\\x1b\\xff");
  out.clear();
  appendPart(out, "title", {{"title", "<b>"}});
  EXPECT_EQ(out, "<p>&lt;b&gt;</p>\n");
  EXPECT_THROW(appendPart(out, "nothing"), std::logic_error);
  EXPECT_THROW(appendPart(out, "title", {{"name", ""}}), std::logic_error);
}

/// A record of 8 bytes a value.
struct Given {
  uint32_t key;
  std::string name;
  std::vector<uint64_t> values;

  [[nodiscard]] Record record() const {
    return {0, key, values.size() > 1, name,
            Values(reinterpret_cast<const unsigned char*>(values.data()),
                   static_cast<uint32_t>(values.size()), 8, 8)};
  }
};

Series seriesOf(const std::vector<std::vector<Given>>& captures) {
  Series series;
  for (const auto& given : captures) {
    Capture capture;
    capture.source = "<" + std::to_string(&given - captures.data()) + ">";
    series.begin(capture);
    for (const Given& each : given) {
      const Record record = each.record();
      series.records({&record, 1});
    }
    series.end(capture);
  }
  return series;
}

struct Shown {
  std::string page;
  std::vector<json> data;

  explicit Shown(std::string text) : page(std::move(text)) {
    static const std::regex kBlock("<script type=\"application/json\"[^>]*>([^<]*)</script>");
    for (std::sregex_iterator at(page.begin(), page.end(), kBlock), end; at != end; ++at) {
      data.push_back(json::parse((*at)[1].str()));
    }
  }

  /// The numbers in the rows' cells, without what sets digits apart.
  [[nodiscard]] std::vector<std::string> numbers() const {
    static const std::regex kNumber("<td class=\"number[^\"]*\">([^\n]*?)</td>");
    std::vector<std::string> found;
    for (std::sregex_iterator at(page.begin(), page.end(), kNumber), end; at != end; ++at) {
      found.push_back(std::regex_replace((*at)[1].str(), std::regex("</?i>"), ""));
    }
    return found;
  }
};

constexpr uint64_t kMost = UINT64_MAX;

TEST(Page, ADifferenceCarriesBothSidesExactly) {
  Sink sink;
  makeHtml({}, sink)->difference(seriesOf({{{7, "<s>", {1, kMost}}, {9, "gone", {3}}, {10, "same", {4}}},
                                           {{7, "<s>", {2, kMost - 1}}, {10, "same", {4}}}}));
  const Shown shown(sink.text);
  ASSERT_EQ(shown.data.size(), 3u);
  EXPECT_EQ(shown.data[0],
            json::parse(R"({"view":"difference","kind":"stats","points":["<0>","<1>"],"over":null})"));
  EXPECT_EQ(shown.data[1], json::parse(R"({"key":7,"name":"<s>","values":
      [[1,"18446744073709551615"],[2,"18446744073709551614"]]})"));
  EXPECT_EQ(shown.data[2], json::parse(R"({"key":9,"name":"gone","values":[3,null]})"));
  EXPECT_EQ(shown.page.find("<s>"), std::string::npos);
}

TEST(Page, ATrendHasItsExtremes) {
  Sink sink;
  makeHtml({}, sink)->trend(
      seriesOf({{{4, "a", {1000}}}, {{4, "a", {500}}}, {{4, "a", {12345678}}}, {}, {{4, "a", {1500}}}}));
  const Shown shown(sink.text);
  const auto numbers = shown.numbers();
  // Behind the five sources' numbers, bytes, records and findings.
  ASSERT_EQ(numbers.size(), 5 * 4 + 7u);
  EXPECT_EQ(std::vector(numbers.end() - 7, numbers.end()),
            std::vector<std::string>({"4", "1000", "1500", "500", "12345678", "+500", "+50.0"}));
  EXPECT_NE(shown.page.find("12<i>345</i><i>678</i>"), std::string::npos);
  EXPECT_EQ(shown.data.back()["values"], json::parse("[1000,500,12345678,null,1500]"));
}

}  // namespace
}  // namespace kspdump
