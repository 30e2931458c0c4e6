// SPDX-License-Identifier: Apache-2.0
// Comma-separated values: a row a value or, of a series, a row a point.

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

class Csv : public View {
 public:
  Csv(const ViewOptions& options, Sink& sink) : View(sink), isSnapshot_(options.isSnapshot) {}

  void head() override {
    if (!isSnapshot_) sink_.text += "source,kind,key,name,element,value\n";
  }

  void begin(Capture& capture) override {
    if (isSnapshot_) intervals_.begin(capture);
    front_.clear();
    appendCsv(front_, capture.source);
    front_.append(",").append(kindName(capture.kind)).append(",");
  }

  void records(std::span<const Record> records) override {
    if (isSnapshot_) return intervals_.records(records);
    Appender appender(sink_);
    std::string name;
    for (const Record& record : records) {
      name.clear();
      appendCsv(name, record.name);
      for (uint32_t i = 0; i < record.values.size(); ++i) {
        appender.text(front_);
        appender.number(record.key);
        appender.text(",");
        appender.text(name);
        appender.text(",");
        if (record.isArray) appender.number(i);
        appender.text(",");
        appender.number(record.values[i]);
        appender.text("\n");
      }
    }
  }

  void end(Capture& capture) override {
    if (!isSnapshot_) return;
    intervals_.end(capture);
    addPoints(intervals_);
    intervals_ = {};
  }

  void trend(const Series& series) override { addPoints(series); }

  void difference(const Series& series) override {
    std::string& out = sink_.text;
    out += "source,kind,key,name,element,old,new,delta\n";
    for (const size_t track : series.tracksInOrder()) {
      const Track& about = series.tracks()[track];
      for (uint32_t i = 0; i < about.elements; ++i) {
        appendCsv(out, series.captures().back().source);
        out.append(",").append(kindName(series.kind())).append(",");
        appendNumber(out, about.key);
        out += ',';
        appendCsv(out, about.name);
        out.append(",").append(about.isArray ? std::to_string(i) : "");
        addOptional(series.value(track, 0, i));
        addOptional(series.value(track, 1, i));
        addOptional(series.delta(track, i));
        endLine();
      }
    }
  }

  void listing(const Listing& listing) override {
    std::string& out = sink_.text;
    for (size_t i = 0; i < listing.columns.size(); ++i) {
      out.append(i == 0 ? "" : ",").append(listing.columns[i].name);
    }
    out += '\n';
    for (const auto& row : listing.rows) {
      for (size_t i = 0; i < row.size(); ++i) {
        if (i != 0) out += ',';
        if (const auto* number = std::get_if<uint64_t>(&row[i])) {
          appendNumber(out, *number);
        } else {
          appendCsv(out, std::get<std::string>(row[i]));
        }
      }
      endLine();
    }
  }

  [[nodiscard]] bool showsFindings() const override { return false; }

 private:
  template <class Number>
  void addOptional(const std::optional<Number>& number) {
    sink_.text.append(",").append(number ? Wide(*number).text() : "");
  }

  /// A column for each value of a track: NAME, or NAME_0 and on of an array. Where keys share a name, they
  /// tell the columns apart.
  static void appendColumns(std::string& out, const Track& track, bool isShared) {
    std::string name = track.name;
    if (isShared) name += "(" + std::to_string(track.key) + ")";
    for (uint32_t i = 0; i < track.elements; ++i) {
      out += ',';
      appendCsv(out, track.isArray ? name + "_" + std::to_string(i) : name);
    }
  }

  void addPoints(const Series& series) {
    std::string& out = sink_.text;
    const bool isSnapshot = series.kind() == Kind::kSnapshot;
    const std::vector<size_t> tracks = series.tracksInOrder();
    std::map<std::string_view, unsigned> keysOfName;
    for (const size_t track : tracks) ++keysOfName[series.tracks()[track].name];
    out += isSnapshot ? "record" : "source";
    if (series.over() != nullptr) {
      out += ',';
      appendCsv(out, "over " + series.over()->name);
    }
    for (const size_t track : tracks) {
      appendColumns(out, series.tracks()[track], keysOfName[series.tracks()[track].name] > 1);
    }
    out += '\n';
    for (size_t point = 0; point < series.points(); ++point) {
      if (isSnapshot) {
        appendNumber(out, series.recordNumber(point));
      } else {
        appendCsv(out, series.captures()[point].source);
      }
      if (series.over() != nullptr) {
        out += ',';
        appendNumber(out, series.over()->values[point]);
      }
      for (const size_t track : tracks) {
        const Values values = series.values(track, point);
        for (uint32_t i = 0; i < series.tracks()[track].elements; ++i) {
          out += ',';
          if (i < values.size()) appendNumber(out, values[i]);
        }
      }
      endLine();
    }
  }

  bool isSnapshot_;
  Series intervals_;
  std::string front_;
};

}  // namespace

std::unique_ptr<View> makeCsv(const ViewOptions& options, Sink& sink) {
  return std::make_unique<Csv>(options, sink);
}

}  // namespace kspdump
