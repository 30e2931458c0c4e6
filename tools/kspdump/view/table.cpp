// Tables for people.

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

#include "tools/kspdump/view/bars.h"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

constexpr size_t kGap = 2;
/// The widest that a name makes its column.
constexpr size_t kWidestName = 34;

void pad(std::string& out, size_t have, size_t want) {
  out.append(want > have ? want - have : 0, ' ');
}

std::string decimal(std::optional<Wide> number, bool withSign = false) {
  if (!number) return "-";
  return (withSign && *number > Wide() ? "+" : "") + number->text();
}

class Table : public View {
 public:
  Table(const ViewOptions& options, Sink& sink) : View(sink), options_(options) {}

  void between() override { sink_.text += '\n'; }

  [[nodiscard]] bool measures(const Capture& /*capture*/) const override { return true; }

  void measure(std::span<const Record> records) override {
    for (const Record& record : records) {
      greatestKey_ = std::max(greatestKey_, record.key);
      nameWidth_ = std::max(nameWidth_, printable(record.name).size());
      greatestSum_ = std::max(greatestSum_, sum(record.values));
    }
  }

  void begin(Capture& capture) override {
    std::string& out = sink_.text;
    out.append(printable(capture.source)).append(": ").append(kindTitle(capture.kind)).append(", ");
    out += counted(capture.bytes.size(), "byte") + ", " + std::to_string(capture.recordCount) +
           (capture.kind == Kind::kSnapshot ? " fields" : " records");
    if (capture.shownCount != capture.recordCount) {
      out += ", " + std::to_string(capture.shownCount) + " shown";
    }
    const uint64_t findings = capture.findings.size() + capture.furtherFindings;
    if (findings != 0) out += ", " + counted(findings, "finding");
    out += '\n';
    if (capture.shownCount == 0) return;
    keyWidth_ = std::max<size_t>(kLeastKey, std::to_string(greatestKey_).size());
    nameWidth_ = std::clamp(nameWidth_, kNameHead.size(), kWidestName);
    valueWidth_ = std::max(kValueHead.size(), greatestSum_.text().size());
    const size_t used = keyWidth_ + nameWidth_ + valueWidth_ + 3 * kGap;
    barWidth_ = options_.width > used + kLeastBars ? options_.width - used : kLeastBars;
    pad(out, kKeyHead.size(), keyWidth_);
    out.append(kKeyHead).append(kGap, ' ').append(kNameHead);
    pad(out, kNameHead.size(), nameWidth_ + kGap + valueWidth_ - kValueHead.size());
    out.append(kValueHead).append(kGap, ' ').append("ELEMENTS\n");
  }

  void records(std::span<const Record> records) override {
    std::string& out = sink_.text;
    for (const Record& record : records) {
      const std::string key = std::to_string(record.key);
      const std::string name = printable(record.name);
      const Wide total = sum(record.values);
      const std::string value = total.text();
      pad(out, key.size(), keyWidth_);
      out.append(key).append(kGap, ' ').append(name);
      pad(out, name.size(), nameWidth_);
      out.append(kGap, ' ');
      pad(out, value.size(), valueWidth_);
      out += value;
      if (record.isArray) {
        out.append(kGap, ' ');
        addBars(record.values, total);
      }
      out += '\n';
      sink_.offer();
    }
  }

  void end(Capture& capture) override {
    addFindings(capture, "");
    greatestKey_ = 0;
    nameWidth_ = 0;
    greatestSum_ = {};
  }

  void difference(const Series& series) override;

  [[nodiscard]] bool showsFindings() const override { return true; }

 private:
  static constexpr std::string_view kKeyHead = "KEY";
  static constexpr std::string_view kNameHead = "NAME";
  static constexpr std::string_view kValueHead = "VALUE/SUM";
  static constexpr size_t kLeastKey = 5;

  void addChanges(const Series& series, const std::vector<size_t>& changed);

  void addFindings(const Capture& capture, const std::string& source) {
    for (const Finding& finding : capture.findings) {
      sink_.text += "! " + source + "offset " + std::to_string(finding.offset) + ": " + finding.reason + "\n";
    }
    if (capture.furtherFindings != 0) {
      sink_.text += "! " + source + counted(capture.furtherFindings, "further finding") + "\n";
    }
  }

  void addBars(const Values& values, const Wide& total) {
    if (total * kBarLevels <= Wide(UINT64_MAX)) {
      narrow_.clear();
      for (uint32_t i = 0; i < values.size(); ++i) narrow_.push_back(values[i]);
      appendBars<uint64_t>(sink_.text, narrow_, barWidth_);
    } else {
      wide_.clear();
      for (uint32_t i = 0; i < values.size(); ++i) wide_.emplace_back(values[i]);
      appendBars<Wide>(sink_.text, wide_, barWidth_);
    }
  }

  ViewOptions options_;
  uint32_t greatestKey_ = 0;
  size_t nameWidth_ = 0;
  Wide greatestSum_;
  size_t keyWidth_ = 0;
  size_t valueWidth_ = 0;
  size_t barWidth_ = 0;
  std::vector<uint64_t> narrow_;
  std::vector<Wide> wide_;
};

void Table::difference(const Series& series) {
  std::string& out = sink_.text;
  std::vector<size_t> changed;
  for (const size_t track : series.tracksInOrder()) {
    if (series.changes(track)) changed.push_back(track);
  }
  out += printable(series.captures().front().source) + " -> " + printable(series.captures().back().source) +
         ": " + std::to_string(changed.size()) + " changed\n";
  addChanges(series, changed);
  for (const Capture& capture : series.captures()) addFindings(capture, printable(capture.source) + ": ");
}

void Table::addChanges(const Series& series, const std::vector<size_t>& changed) {
  if (changed.empty()) return;
  constexpr size_t kNameColumn = 1;
  std::string& out = sink_.text;
  std::vector<std::vector<std::string>> rows = {{"KEY", "NAME", "OLD", "NEW", "DELTA"}};
  for (const size_t track : changed) {
    const auto before = series.sum(track, 0);
    const auto after = series.sum(track, 1);
    std::optional<Wide> delta;
    if (before && after) delta = *after - *before;
    rows.push_back({std::to_string(series.tracks()[track].key), printable(series.tracks()[track].name),
                    decimal(before), decimal(after), decimal(delta, true)});
  }
  std::vector<size_t> widths(rows[0].size());
  for (const auto& row : rows) {
    for (size_t i = 0; i < row.size(); ++i) widths[i] = std::max(widths[i], row[i].size());
  }
  size_t used = 0;
  for (const size_t column : widths) used += column + kGap;
  // Names give way to the numbers and to a small picture; one that is longer widens its own line.
  constexpr size_t kLeastName = 16;
  const size_t wanted = used + kLeastBars;
  const size_t tooWide = wanted > options_.width ? wanted - options_.width : 0;
  const size_t spare = widths[kNameColumn] > kLeastName ? widths[kNameColumn] - kLeastName : 0;
  widths[kNameColumn] -= std::min(tooWide, spare);
  used -= std::min(tooWide, spare);

  for (size_t row = 0; row < rows.size(); ++row) {
    for (size_t i = 0; i < widths.size(); ++i) {
      const std::string& cell = rows[row][i];
      const std::string padding(cell.size() < widths[i] ? widths[i] - cell.size() : 0, ' ');
      out.append(i == 0 ? "" : "  ").append(i == kNameColumn ? cell + padding : padding + cell);
    }
    if (row == 0) {
      out += "  ELEMENTS";
    } else if (const Track& track = series.tracks()[changed[row - 1]]; track.isArray) {
      wide_.clear();
      for (uint32_t i = 0; i < track.elements; ++i) {
        wide_.push_back(series.delta(changed[row - 1], i).value_or(Wide()).magnitude());
      }
      out += "  ";
      appendBars<Wide>(out, wide_, options_.width > used + kLeastBars ? options_.width - used : kLeastBars);
    }
    out += '\n';
    sink_.offer();
  }
}

}  // namespace

std::unique_ptr<View> makeTable(const ViewOptions& options, Sink& sink) {
  return std::make_unique<Table>(options, sink);
}

}  // namespace kspdump
