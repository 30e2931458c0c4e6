// SPDX-License-Identifier: Apache-2.0
// Tables for people.

#include <algorithm>
#include <cctype>
#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "ksp/detail/decimal.hpp"
#include "tools/kspdump/view/bars.h"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/grid.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

constexpr size_t kGap = Grid::kGap;
/// Names that are cut keep so many columns.
constexpr size_t kLeastName = 16;

std::string decimal(std::optional<Wide> number, bool withSign = false) {
  if (!number) return "-";
  return (withSign && *number > Wide() ? "+" : "") + number->text();
}

std::string percent(std::optional<double> number) {
  return number ? (*number > 0 ? "+" : "") + fixed(*number, 1) : "-";
}

class Table : public View {
 public:
  Table(const ViewOptions& options, Sink& sink) : View(sink), options_(options) {}

  void between() override { sink_.text += '\n'; }

  [[nodiscard]] bool measures(const Capture& /*capture*/) const override { return true; }

  void measure(std::span<const Record> records) override {
    for (const Record& record : records) {
      greatestKey_ = std::max(greatestKey_, record.key);
      nameWidth_ =
          std::max(nameWidth_, record.isListed ? record.name.size() : columnsOf(printable(record.name)));
      if (const auto total = narrowSum(record.values)) {
        greatestNarrow_ = std::max(greatestNarrow_, *total);
      } else {
        greatestSum_ = std::max(greatestSum_, sum(record.values));
      }
    }
  }

  void begin(Capture& capture) override {
    constexpr uint64_t kFew = 3;
    std::string& out = sink_.text;
    out.append(printable(capture.source)).append(": ").append(kindTitle(capture.kind)).append(", ");
    out += counted(capture.bytes.size(), "byte") + ", " +
           counted(capture.recordCount, capture.kind == Kind::kSnapshot ? "field" : "record");
    if (capture.shownCount != capture.recordCount) {
      out += ", " + std::to_string(capture.shownCount) + " shown";
    }
    const uint64_t findings = capture.findings.size() + capture.furtherFindings;
    if (findings != 0) out += ", " + counted(findings, "finding");
    out += '\n';
    if (capture.shownCount == 0) return;
    expands_ = options_.expands || (options_.isTerminal && capture.shownCount <= kFew);
    keyWidth_ = std::max<size_t>(kLeastKey, std::to_string(greatestKey_).size());
    nameWidth_ = std::max(nameWidth_, kNameHead.size());
    greatestSum_ = std::max(greatestSum_, Wide(greatestNarrow_));
    valueWidth_ = std::max(kValueHead.size(), greatestSum_.text().size());
    const size_t numbers = keyWidth_ + valueWidth_ + 3 * kGap + kLeastBars;
    if (options_.isTerminal) {
      const size_t room = options_.width > numbers ? options_.width - numbers : 0;
      nameWidth_ = std::min(nameWidth_, std::max(room, kLeastName));
    }
    const size_t used = nameWidth_ + numbers - kLeastBars;
    barWidth_ = std::max(options_.width, used + kLeastBars) - used;
    valueEnd_ = keyWidth_ + kGap + nameWidth_ + kGap + valueWidth_;
    appendPadded(out, kKeyHead, keyWidth_, true);
    out.append(kGap, ' ');
    appendPadded(out, kNameHead, nameWidth_, false);
    out.append(kGap, ' ');
    appendPadded(out, kValueHead, valueWidth_, true);
    out.append(kGap, ' ').append("ELEMENTS\n");
  }

  void records(std::span<const Record> records) override {
    std::string& out = sink_.text;
    for (const Record& record : records) {
      const std::optional<uint64_t> narrow = narrowSum(record.values);
      if (record.isListed && record.name.size() <= nameWidth_ && narrow) {
        // The usual row: spaces, and over them what is known to fit.
        const size_t begin = out.size();
        out.append(valueEnd_ + (record.isArray ? kGap : 0), ' ');
        char* const row = out.data() + begin;
        putNumber(row + keyWidth_, record.key);
        record.name.copy(row + keyWidth_ + kGap, record.name.size());
        putNumber(row + valueEnd_, *narrow);
      } else {
        addCell(std::to_string(record.key), keyWidth_, true);
        addCell(cutTo(printable(record.name), nameWidth_), nameWidth_, false);
        appendPadded(out, sum(record.values).text(), valueWidth_, true);
        if (record.isArray) out.append(kGap, ' ');
      }
      if (record.isArray) appendBars(out, record.values, barWidth_);
      out += '\n';
      if (expands_ && record.isArray) addElements(record.values, sum(record.values));
      sink_.offer();
    }
  }

  void end(Capture& capture) override {
    appendFindings(sink_.text, capture);
    greatestKey_ = 0;
    nameWidth_ = 0;
    greatestNarrow_ = 0;
    greatestSum_ = {};
  }

  void difference(const Series& series) override;
  void trend(const Series& series) override;
  void listing(const Listing& listing) override;

  [[nodiscard]] bool showsFindings() const override { return true; }

 private:
  template <class AddPicture>
  void addRows(Grid& grid, std::string_view pictures, AddPicture addPicture);

  static constexpr std::string_view kKeyHead = "KEY";
  static constexpr std::string_view kNameHead = "NAME";
  static constexpr std::string_view kValueHead = "VALUE/SUM";
  static constexpr size_t kLeastKey = 5;

  void addCell(std::string_view text, size_t width, bool right) {
    appendPadded(sink_.text, text, width, right);
    sink_.text.append(kGap, ' ');
  }

  /// A row an element: its index, value, share of the sum, and a bar.
  void addElements(const Values& values, const Wide& total) {
    constexpr size_t kShareWidth = 7;
    constexpr double kWhole = 100;
    const size_t longest = std::max(barWidth_, kShareWidth + kGap + 1) - kShareWidth - kGap;
    uint64_t largest = 0;
    for (uint32_t i = 0; i < values.size(); ++i) largest = std::max(largest, values[i]);
    for (uint32_t i = 0; i < values.size(); ++i) {
      const uint64_t value = values[i];
      const double share = value == 0 ? 0 : static_cast<double>(value) / static_cast<double>(total) * kWhole;
      addCell("", keyWidth_, true);
      addCell("[" + std::to_string(i) + "]", nameWidth_, false);
      addCell(std::to_string(value), valueWidth_, true);
      appendPadded(sink_.text, fixed(share, 1) + " %", kShareWidth, true);
      if (value != 0) sink_.text.append(kGap, ' ');
      appendBar(sink_.text, value, largest, longest);
      endLine();
    }
  }

  /// The sum of values, where 64 bits hold it.
  static std::optional<uint64_t> narrowSum(const Values& values) {
    uint64_t sum = 0;
    bool isWide = false;
    values.forEach(0, values.size(), [&](uint64_t value) {
      sum += value;
      isWide |= sum < value;
    });
    if (isWide) return std::nullopt;
    return sum;
  }

  /// Writes a number that ends in front of `end`, with room for it there.
  static void putNumber(char* end, uint64_t number) {
    char text[ksp::kDecimalRoom];
    const std::ptrdiff_t size = ksp::writeDecimal(text, number) - text;
    std::copy_n(text, size, end - size);
  }

  ViewOptions options_;
  bool expands_ = false;
  uint32_t greatestKey_ = 0;
  size_t nameWidth_ = 0;
  /// Of the sums that 64 bits hold, and of the others.
  uint64_t greatestNarrow_ = 0;
  Wide greatestSum_;
  size_t keyWidth_ = 0;
  size_t valueWidth_ = 0;
  size_t barWidth_ = 0;
  /// Where the values' column ends.
  size_t valueEnd_ = 0;
};

void Table::difference(const Series& series) {
  std::string& out = sink_.text;
  const std::vector<size_t> tracks = series.tracksInOrder();
  out += printable(series.captures().front().source) + " -> " + printable(series.captures().back().source) +
         ": " + std::to_string(tracks.size()) + (series.showsUnchanged() ? " shown\n" : " changed\n");
  Grid grid({{"KEY", true}, {"NAME", false}, {"OLD", true}, {"NEW", true}, {"DELTA", true}, {"%", true}});
  for (const size_t track : tracks) {
    grid.add({std::to_string(series.tracks()[track].key), printable(series.tracks()[track].name),
              decimal(series.sum(track, 0)), decimal(series.sum(track, 1)),
              decimal(series.change(track), true), percent(series.percent(track))});
  }
  addRows(grid, "ELEMENTS", [&](size_t row, size_t width) {
    const Track& track = series.tracks()[tracks[row]];
    if (!track.isArray) return;
    std::vector<Wide> changes;
    for (uint32_t i = 0; i < track.elements; ++i) {
      changes.push_back(series.delta(tracks[row], i).value_or(Wide()));
    }
    appendChanges(sink_.text, changes, width);
  });
  appendFindings(out, series);
}

void Table::trend(const Series& series) {
  std::string& out = sink_.text;
  const std::vector<size_t> tracks = series.tracksInOrder();
  out += std::string(kindTitle(series.kind())) + ", " + counted(series.points(), "capture") + ", ";
  out += std::to_string(tracks.size()) + (series.showsUnchanged() ? " shown" : " changed");
  std::vector<Grid::Column> columns = {{"KEY", true},   {"NAME", false},    {"FIRST", true},  {"LAST", true},
                                       {"LEAST", true}, {"GREATEST", true}, {"CHANGE", true}, {"%", true}};
  const Over* const over = series.over();
  if (over != nullptr) {
    out += ", over " + printable(over->name) + " " + std::to_string(over->values.front()) + " to " +
           std::to_string(over->values.back());
    columns.push_back({"PER UNIT", true});
  }
  out += '\n';
  Grid grid(columns);
  for (const size_t track : tracks) {
    const Course course(series.sums(track));
    std::vector<std::string> row = {std::to_string(series.tracks()[track].key),
                                    printable(series.tracks()[track].name),
                                    decimal(course.first),
                                    decimal(course.last),
                                    decimal(course.extremes.least),
                                    decimal(course.extremes.greatest),
                                    decimal(course.change, true),
                                    percent(course.percent)};
    if (over != nullptr) {
      const auto each = over->perUnit(course.change);
      row.push_back(each ? fixed(*each, 3) : "-");
    }
    grid.add(row);
  }
  addRows(grid, "TREND", [&](size_t row, size_t width) {
    std::vector<std::optional<double>> values;
    for (const auto& value : series.sums(tracks[row])) {
      values.push_back(value ? std::optional(static_cast<double>(*value)) : std::nullopt);
    }
    appendSparkline(sink_.text, values, width);
  });
  appendFindings(out, series);
}

/// A series' rows with a picture behind each, made by `addPicture(row, width)`.
template <class AddPicture>
void Table::addRows(Grid& grid, std::string_view pictures, AddPicture addPicture) {
  constexpr size_t kName = 1;
  std::string& out = sink_.text;
  if (options_.isTerminal) grid.fit(kName, kLeastName, options_.width, kGap + kLeastBars);
  const size_t used = grid.width() + kGap;
  for (size_t row = 0; row < grid.rows(); ++row) {
    if (row == 0) {
      grid.appendHead(out);
      out.append(kGap, ' ').append(pictures).append("\n");
    }
    grid.appendRow(out, row);
    const size_t bare = out.size();
    out.append(kGap, ' ');
    const size_t begun = out.size();
    addPicture(row, std::max(options_.width, used + kLeastBars) - used);
    if (out.size() == begun) out.resize(bare);
    endLine();
  }
}

void Table::listing(const Listing& listing) {
  std::vector<Grid::Column> columns;
  for (size_t i = 0; i < listing.columns.size(); ++i) {
    std::string head = listing.columns[i].name;
    for (char& c : head) c = static_cast<char>(std::toupper(c));
    const bool isNumber = !listing.rows.empty() && std::holds_alternative<uint64_t>(listing.rows.front()[i]);
    columns.push_back({head, isNumber});
  }
  Grid grid(columns);
  for (const auto& row : listing.rows) {
    std::vector<std::string> cells;
    for (size_t i = 0; i < row.size(); ++i) {
      const auto* number = std::get_if<uint64_t>(&row[i]);
      cells.push_back(number != nullptr ? std::to_string(*number) + listing.columns[i].unit
                                        : printable(std::get<std::string>(row[i])));
    }
    grid.add(cells);
  }
  grid.appendHead(sink_.text);
  sink_.text += '\n';
  for (size_t row = 0; row < grid.rows(); ++row) {
    grid.appendRow(sink_.text, row);
    endLine();
  }
}

}  // namespace

std::unique_ptr<View> makeTable(const ViewOptions& options, Sink& sink) {
  return std::make_unique<Table>(options, sink);
}

}  // namespace kspdump
