// SPDX-License-Identifier: Apache-2.0
// A line a value: least, mean, greatest, and how it went over the points of a series.

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

#include "tools/kspdump/series/ratio.h"
#include "tools/kspdump/view/bars.h"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/grid.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

/// A line's values, as far as a picture needs them.
using Line = std::vector<std::optional<double>>;

class Chart : public View {
 public:
  Chart(const ViewOptions& options, Sink& sink) : View(sink), options_(options) {}

  void begin(Capture& capture) override { intervals_.begin(capture); }
  void records(std::span<const Record> records) override { intervals_.records(records); }

  void end(Capture& capture) override {
    intervals_.end(capture);
    std::string& out = sink_.text;
    const std::string what =
        ": " + std::string(kindTitle(capture.kind)) + ", " + counted(intervals_.points(), "interval");
    out += cutTo(printable(capture.source), options_.width - std::min(options_.width, what.size())) + what +
           "\n";
    if (intervals_.points() != 0) addIntervals();
    appendFindings(sink_.text, capture);
    intervals_ = {};
  }

  void trend(const Series& series) override {
    std::string& out = sink_.text;
    out += std::string(kindTitle(series.kind())) + ", " + counted(series.points(), "capture");
    if (series.over() != nullptr) out += " over " + printable(series.over()->name);
    out += '\n';
    std::vector<Line> lines;
    Grid grid(columns());
    for (const size_t track : series.tracksInOrder()) {
      addLine(grid, lines, series.tracks()[track].name, series.sums(track));
    }
    addLines(grid, lines);
    appendFindings(out, series);
  }

  [[nodiscard]] bool showsFindings() const override { return true; }

 private:
  static constexpr int kDecimals = 2;
  static constexpr size_t kName = 0;
  static constexpr size_t kLeastName = 8;

  static std::vector<Grid::Column> columns() {
    return {{"NAME", false}, {"LEAST", true}, {"MEAN", true}, {"GREATEST", true}};
  }

  static std::string text(std::optional<double> number) { return number ? fixed(*number, kDecimals) : "-"; }
  static std::string text(std::optional<Wide> number) { return number ? number->text() : "-"; }

  /// The fields of each interval, and what is derived from them.
  void addIntervals() {
    const Series& series = intervals_;
    std::vector<Line> lines;
    Grid grid(columns());
    for (size_t track = 0; track < series.tracks().size(); ++track) {
      const Track& about = series.tracks()[track];
      for (uint32_t i = 0; i < about.elements; ++i) {
        std::vector<std::optional<Wide>> values;
        for (size_t point = 0; point < series.points(); ++point) {
          values.emplace_back(series.value(track, point, i));
        }
        addLine(grid, lines, about.isArray ? about.name + "_" + std::to_string(i) : about.name, values);
      }
    }
    for (const Ratio& ratio : ratiosOf(series)) {
      Line line;
      Extremes<double> extremes;
      for (size_t point = 0; point < series.points(); ++point) {
        const auto value = ratioAt(series, ratio, point);
        line.push_back(value);
        if (value) extremes.take(*value);
      }
      grid.add({printable(ratio.name), text(extremes.least), text(ratioOverall(series, ratio)),
                text(extremes.greatest)});
      lines.push_back(thinned(line));
    }
    addLines(grid, lines);
  }

  void addLine(Grid& grid, std::vector<Line>& lines, const std::string& name,
               const std::vector<std::optional<Wide>>& values) {
    const Course course(values);
    grid.add(
        {printable(name), text(course.extremes.least), text(course.mean), text(course.extremes.greatest)});
    Line line;
    for (const auto& value : values) {
      line.push_back(value ? std::optional(static_cast<double>(*value)) : std::nullopt);
    }
    lines.push_back(thinned(line));
  }

  /// As many values as a picture has columns, each the greatest of its share.
  [[nodiscard]] Line thinned(const Line& line) const {
    if (line.size() <= options_.width) return line;
    Line thin;
    for (size_t i = 0; i < options_.width; ++i) {
      std::optional<double> greatest;
      for (size_t at = i * line.size() / options_.width; at < (i + 1) * line.size() / options_.width; ++at) {
        if (line[at]) greatest = std::max(greatest.value_or(*line[at]), *line[at]);
      }
      thin.push_back(greatest);
    }
    return thin;
  }

  void addLines(Grid& grid, const std::vector<Line>& lines) {
    if (lines.empty()) return;
    std::string& out = sink_.text;
    grid.fit(kName, kLeastName, options_.width, Grid::kGap + kLeastBars);
    const size_t used = grid.width() + Grid::kGap;
    grid.appendHead(out);
    out += '\n';
    for (size_t row = 0; row < lines.size(); ++row) {
      grid.appendRow(out, row);
      if (used < options_.width) {
        out.append(Grid::kGap, ' ');
        appendSparkline(out, lines[row], options_.width - used);
      }
      endLine();
    }
  }

  ViewOptions options_;
  Series intervals_;
};

}  // namespace

std::unique_ptr<View> makeChart(const ViewOptions& options, Sink& sink) {
  return std::make_unique<Chart>(options, sink);
}

}  // namespace kspdump
