// SPDX-License-Identifier: Apache-2.0
// Pages for a browser: one file that needs nothing else, and shows its tables without scripts too.

#include <algorithm>
#include <charconv>
#include <cmath>
#include <ctime>
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include "snapshot/header.h"
#include "tools/kspdump/series/ratio.h"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/page/page.h"
#include "tools/kspdump/view/page/picture.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

constexpr auto kMarkup = Field::Form::kMarkup;
constexpr double kMissing = std::numeric_limits<double>::quiet_NaN();

/// Now, for people everywhere.
std::string timeOfReading() {
  const std::time_t now = std::time(nullptr);
  std::tm utc = {};
  char text[32];
  gmtime_r(&now, &utc);
  return {text, std::strftime(text, sizeof text, "%Y-%m-%d %H:%M UTC", &utc)};
}

/// A number's digits, in groups of three that the style sets apart.
std::string grouped(std::string_view number) {
  std::string out;
  const bool hasSign = number.starts_with('-') || number.starts_with('+');
  const size_t whole = std::min(number.find('.'), number.size());
  for (size_t i = 0; i < whole; ++i) {
    const bool isHead = (whole - i) % 3 != 0 || i <= (hasSign ? 1 : 0);
    if (!isHead) out += "<i>";
    out += number[i];
    if ((whole - i) % 3 == 1 && out.find("<i>") != out.npos) out += "</i>";
  }
  return out.append(number.substr(whole));
}

std::string decimal(std::optional<Wide> number, bool withSign = false) {
  if (!number) return "";
  return grouped((withSign && *number > Wide() ? "+" : "") + number->text());
}

std::string rounded(double number, int digits) {
  return grouped(fixed(number, digits));
}

/// With as many digits as its reader can use.
std::string shortest(double number) {
  constexpr int kDigits = 6;
  char text[32];
  return {text, std::to_chars(text, std::end(text), number, std::chars_format::general, kDigits).ptr};
}

std::string percent(std::optional<double> number) {
  if (!number) return "";
  return (*number > 0 ? "+" : "") + rounded(*number, 1);
}

/// Appends a JSON text in which nothing is markup.
void appendSafeJson(std::string& out, std::string_view text) {
  std::string json;
  appendJson(json, legible(text));
  for (const char c : json) {
    if (c == '<') {
      out += "\\u003c";
    } else {
      out += c;
    }
  }
}

/// Appends a value for the page's script, which rounds numbers above 2^53: these are texts.
void appendValue(std::string& out, uint64_t value) {
  constexpr uint64_t kGreatestExact = uint64_t{1} << 53;
  const char* const quote = value > kGreatestExact ? "\"" : "";
  out += quote;
  appendNumber(out, value);
  out += quote;
}

/// What a page can be about; each has its columns.
enum class About { kCapture, kDifference, kTrend, kSnapshot };

struct Column {
  std::string_view title;
  std::string_view classes;
};
using Columns = std::initializer_list<Column>;

std::string_view nameOf(About about) {
  switch (about) {
    case About::kCapture:
      return "capture";
    case About::kDifference:
      return "difference";
    case About::kTrend:
      return "trend";
    default:
      return "snapshot";
  }
}

Columns columnsOf(About about) {
  static constexpr Column kKey = {"Key", "number key"};
  static constexpr Column kName = {"Name", ""};
  static constexpr Column kElements = {"Elements", ""};
  static constexpr Column kCourse = {"Course", ""};
  static const Columns kCapture = {kKey, kName, {"Value or sum", "number"}, kElements};
  static const Columns kDifference = {kKey,
                                      kName,
                                      {"Old", "number spare"},
                                      {"New", "number spare"},
                                      {"Change", "number"},
                                      {"%", "number"},
                                      kElements};
  static const Columns kTrend = {kKey,
                                 kName,
                                 {"First", "number spare"},
                                 {"Last", "number"},
                                 {"Least", "number spare"},
                                 {"Greatest", "number spare"},
                                 {"Change", "number spare"},
                                 {"%", "number"},
                                 kCourse};
  static const Columns kSnapshot = {
      {"No.", "number key"}, {"Field", ""},      {"First", "number spare"}, {"Last", "number spare"},
      {"Least", "number"},   {"Mean", "number"}, {"Greatest", "number"},    kCourse};
  switch (about) {
    case About::kCapture:
      return kCapture;
    case About::kDifference:
      return kDifference;
    case About::kTrend:
      return kTrend;
    default:
      return kSnapshot;
  }
}

class Html : public View {
 public:
  using View::View;

  void head() override {
    const std::string scripts = std::string(kChartScript.hash).append(" ").append(kPageScript.hash);
    part("head", {{"scriptHashes", scripts, kMarkup},
                  {"styleHashes", kPageStyle.hash, kMarkup},
                  {"style", kPageStyle.text, kMarkup}});
  }

  void tail() override {
    part("tail", {{"charts", kChartScript.text, kMarkup}, {"script", kPageScript.text, kMarkup}});
  }

  /// What was found in a capture stands above its records, and is known when they come again.
  [[nodiscard]] bool measures(const Capture& capture) const override {
    return capture.kind != Kind::kSnapshot;
  }

  void begin(Capture& capture) override {
    isSnapshot_ = capture.kind == Kind::kSnapshot;
    if (isSnapshot_) {
      series_ = {};
      series_.begin(capture);
    } else {
      beginSection(About::kCapture, capture.source, {&capture, 1});
    }
  }

  void records(std::span<const Record> records) override {
    if (isSnapshot_) return series_.records(records);
    for (const Record& record : records) {
      points_.assign(1, record.values);
      row(About::kCapture, record.key, record.name, record.isArray);
    }
  }

  void end(Capture& capture) override {
    if (isSnapshot_) {
      series_.end(capture);
      snapshot();
    }
    part("section-end");
  }

  void difference(const Series& series) override {
    head();
    showChanges(About::kDifference, series, " → ");
    tail();
  }

  void trend(const Series& series) override {
    head();
    showChanges(About::kTrend, series, " … ");
    tail();
  }

  [[nodiscard]] bool showsFindings() const override { return true; }

 private:
  void part(std::string_view name, std::initializer_list<Field> fields = {}) {
    appendPart(sink_.text, name, fields);
    sink_.offer();
  }

  void beginSection(About about, const std::string& heading, std::span<const Capture> captures) {
    uint64_t bytes = 0;
    uint64_t records = 0;
    uint64_t shown = 0;
    uint64_t findings = 0;
    for (const Capture& capture : captures) {
      bytes += capture.size;
      records += capture.recordCount;
      shown += capture.shownCount;
      findings += capture.findings.size() + capture.furtherFindings;
    }
    const bool isSnapshot = about == About::kSnapshot;
    std::string counts = captures.size() > 1 ? counted(captures.size(), "capture") + ", " : "";
    counts += counted(bytes, "byte") + ", ";
    counts += isSnapshot ? counted(series_.points(), "interval") : counted(records, "record");
    if (shown != records && !isSnapshot) counts += ", " + std::to_string(shown) + " shown";
    counts += findings == 0 ? ", no findings" : ", " + counted(findings, "finding");
    part("section", {{"heading", heading},
                     {"kind", kindTitle(captures.front().kind)},
                     {"counts", counts},
                     {"time", timeOfReading()},
                     {"version", KSP_VERSION}});
    if (const Bytes header = captures.front().header; !header.empty()) {
      const ksp::SnapshotHeader reader(header.data());
      if (reader.hasTitle()) part("title", {{"title", reader.title()}});
    }
    if (captures.size() > 1) listSources(captures);
    if (findings != 0) listFindings(captures);

    std::string json = "{\"view\":\"";
    json.append(nameOf(about)).append("\",\"kind\":\"").append(kindName(captures.front().kind));
    json += "\",\"points\":[";
    const size_t points = isSnapshot         ? series_.points()
                          : over_ != nullptr ? over_->values.size()
                                             : captures.size();
    for (size_t i = 0; i < points; ++i) {
      if (i != 0) json += ',';
      if (isSnapshot) {
        appendNumber(json, series_.recordNumber(i));
      } else {
        appendSafeJson(json, captures[i].source);
      }
    }
    json += "],\"over\":";
    if (over_ != nullptr) {
      json += "{\"name\":";
      appendSafeJson(json, over_->name);
      json += ",\"values\":[";
      for (size_t i = 0; i < over_->values.size(); ++i) {
        if (i != 0) json += ',';
        appendValue(json, over_->values[i]);
      }
      json += "]}";
    } else {
      json += "null";
    }
    json += "}";
    part("table", {{"about", json, kMarkup}});
    columns_ = columnsOf(about);
    const std::string unit = over_ != nullptr ? "Per " + over_->name : "";
    if (over_ != nullptr) columns_.insert(columns_.end() - 1, {unit, "number spare"});
    for (const Column& column : columns_) {
      part("column", {{"class", column.classes}, {"title", column.title}});
    }
    part("rows");
  }

  void listSources(std::span<const Capture> captures) {
    part("sources", {{"count", std::to_string(captures.size())}});
    for (size_t i = 0; i < captures.size(); ++i) {
      const Capture& capture = captures[i];
      part("source", {{"number", std::to_string(i + 1)},
                      {"source", capture.source},
                      {"bytes", grouped(std::to_string(capture.size)), kMarkup},
                      {"records", grouped(std::to_string(capture.recordCount)), kMarkup},
                      {"findings", std::to_string(capture.findings.size() + capture.furtherFindings)}});
    }
    part("sources-end");
  }

  void listFindings(std::span<const Capture> captures) {
    part("findings");
    for (const Capture& capture : captures) {
      for (const Finding& finding : capture.findings) {
        part("finding", {{"source", capture.source},
                         {"offset", std::to_string(finding.offset)},
                         {"reason", finding.reason}});
      }
      if (capture.furtherFindings != 0) {
        part("further",
             {{"source", capture.source}, {"count", counted(capture.furtherFindings, "further finding")}});
      }
    }
    part("findings-end");
  }

  void showChanges(About about, const Series& series, const char* between) {
    const std::vector<Capture>& captures = series.captures();
    over_ = series.over();
    beginSection(about, captures.front().source + between + captures[series.points() - 1].source, captures);
    for (const size_t track : series.tracksInOrder()) {
      points_.clear();
      for (size_t point = 0; point < series.points(); ++point) points_.push_back(series.values(track, point));
      const Track& of = series.tracks()[track];
      row(about, of.key, of.name, of.isArray);
    }
    part("section-end");
  }

  /// A row a field, and of an array a row an element, unless it has too many for a chart.
  void snapshot() {
    constexpr uint32_t kMostLines = 16;
    beginSection(About::kSnapshot, series_.captures().front().source, series_.captures());
    if (series_.points() == 0) return;
    for (size_t track = 0; track < series_.tracks().size(); ++track) {
      const Track& of = series_.tracks()[track];
      const bool isApart = of.isArray && of.elements <= kMostLines;
      for (uint32_t element = 0; element < (isApart ? of.elements : 1); ++element) {
        points_.clear();
        for (size_t point = 0; point < series_.points(); ++point) {
          const Values values = series_.values(track, point);
          points_.push_back(isApart ? values.only(element) : values);
        }
        row(About::kSnapshot, of.key, isApart ? of.name + "_" + std::to_string(element) : of.name,
            of.isArray && !isApart);
      }
    }
    for (const Ratio& ratio : ratiosOf(series_)) row(ratio);
  }

  /// A row with the values of `points_`.
  void row(About about, uint32_t key, std::string_view name, bool isArray) {
    const bool isSeries = about == About::kTrend || about == About::kSnapshot;
    uint32_t elements = 0;
    for (const Values& values : points_) elements = std::max(elements, values.size());
    const std::vector<std::string> numbers = numbersOf(about);
    beginRow(isArray || isSeries, std::to_string(key), name, numbers, isArray ? std::to_string(elements) : "",
             pictureOf(about, isArray, elements));
    std::string& json = sink_.text;
    json += "{\"key\":";
    appendNumber(json, key);
    json += ",\"name\":";
    appendSafeJson(json, name);
    appendValues(isArray);
    part("row-end");
  }

  /// A row that is worked out from two of a snapshot's fields.
  void row(const Ratio& ratio) {
    constexpr int kDecimals = 2;
    std::vector<std::optional<double>> values;
    Extremes<double> extremes;
    for (size_t point = 0; point < series_.points(); ++point) {
      const auto value = ratioAt(series_, ratio, point);
      values.push_back(value);
      if (value) extremes.take(*value);
    }
    const auto overall = ratioOverall(series_, ratio);
    if (!overall) return;
    std::vector<std::string> numbers;
    for (const auto& number : {values.front(), values.back(), extremes.least, overall, extremes.greatest}) {
      numbers.push_back(number ? rounded(*number, kDecimals) : "");
    }
    drawn_.clear();
    for (const auto& value : values) drawn_.push_back(value.value_or(kMissing));
    beginRow(true, "", ratio.name, numbers, "", drawLine(drawn_));
    std::string& json = sink_.text;
    json += "{\"key\":null,\"name\":";
    appendSafeJson(json, ratio.name);
    json += ",\"values\":[";
    for (const auto& value : values) {
      if (&value != &values.front()) json += ',';
      json += value ? shortest(*value) : "null";
      sink_.offer();
    }
    json += "]}";
    part("row-end");
  }

  /// A row's cells, up to what the last of them has for the script.
  void beginRow(bool opens, std::string_view key, std::string_view name,
                const std::vector<std::string>& numbers, std::string_view elements,
                std::string_view picture) {
    part("row", {{"class", opens ? "opens" : ""}, {"key", key}, {"name", name}});
    auto column = columns_.begin() + 2;
    for (const std::string& number : numbers) {
      part("number", {{"class", (column++)->classes}, {"number", number, kMarkup}});
    }
    part("picture", {{"elements", elements}, {"picture", picture, kMarkup}});
  }

  void appendValues(bool isArray) {
    std::string& json = sink_.text;
    json += ",\"values\":[";
    for (size_t i = 0; i < points_.size(); ++i) {
      const Values& values = points_[i];
      if (i != 0) json += ',';
      if (values.empty()) {
        json += "null";
        continue;
      }
      if (isArray) json += '[';
      for (uint32_t element = 0; element < values.size(); ++element) {
        if (element != 0) json += ',';
        appendValue(json, values[element]);
        sink_.offer();
      }
      if (isArray) json += ']';
    }
    json += "]}";
  }

  /// What stands in a row's cells of numbers.
  std::vector<std::string> numbersOf(About about) {
    totals_.clear();
    for (const Values& values : points_) {
      totals_.push_back(values.empty() ? std::nullopt : std::optional(sum(values)));
    }
    const Course course(totals_);
    if (about == About::kCapture) return {decimal(course.first)};
    std::vector<std::string> numbers = {decimal(course.first), decimal(course.last)};
    const auto add = [&](std::string number) { numbers.push_back(std::move(number)); };
    if (about != About::kDifference) add(decimal(course.extremes.least));
    if (about == About::kSnapshot) add(mean(course.mean));
    if (about != About::kDifference) add(decimal(course.extremes.greatest));
    if (about == About::kSnapshot) return numbers;
    add(decimal(course.change, true));
    add(percent(course.percent));
    if (over_ != nullptr) add(perUnit(over_->perUnit(course.change)));
    return numbers;
  }

  static std::string mean(std::optional<double> number) {
    if (!number) return "";
    return rounded(*number, *number < 10 ? 2 : *number < 1000 ? 1 : 0);
  }

  /// A change by what the captures went over meanwhile.
  static std::string perUnit(std::optional<double> each) {
    constexpr double kLarge = 100;
    if (!each) return "";
    return rounded(*each, std::abs(*each) < kLarge ? 3 : 0);
  }

  std::string pictureOf(About about, bool isArray, uint32_t elements) {
    if (about == About::kTrend || about == About::kSnapshot) {
      drawn_.clear();
      for (const auto& total : totals_) drawn_.push_back(total ? static_cast<double>(*total) : kMissing);
      return drawLine(drawn_);
    }
    if (!isArray) return "";
    const Values& from = points_.front();
    const Values& to = points_.back();
    return drawBars(elements, [&](size_t at) {
      const auto i = static_cast<uint32_t>(at);
      if (about == About::kCapture) return static_cast<double>(to[i]);
      const bool isInBoth = i < from.size() && i < to.size();
      return isInBoth ? static_cast<double>(Wide(to[i]) - Wide(from[i])) : kMissing;
    });
  }

  bool isSnapshot_ = false;
  Series series_;
  std::vector<Column> columns_;
  /// What the captures of a trend are ordered by; null for their order.
  const Over* over_ = nullptr;
  // Of the row that is made; kept for the room they have.
  std::vector<Values> points_;
  std::vector<std::optional<Wide>> totals_;
  std::vector<double> drawn_;
};

}  // namespace

std::unique_ptr<View> makeHtml(const ViewOptions& /*options*/, Sink& sink) {
  return std::make_unique<Html>(sink);
}

}  // namespace kspdump
