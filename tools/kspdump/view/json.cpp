// SPDX-License-Identifier: Apache-2.0
// JSON: a document a line and a capture, or one for a difference.

#include <array>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "ksp/detail/key_name.hpp"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

/// The findings of captures as a document's members, on request with the source of each.
void appendFindings(std::string& out, std::string_view member, std::span<const Capture> captures,
                    bool withSources = false) {
  out.append("\"").append(member).append("\":[");
  const char* separator = "";
  uint64_t further = 0;
  for (const Capture& capture : captures) {
    further += capture.furtherFindings;
    for (const Finding& finding : capture.findings) {
      out.append(separator).append("{");
      separator = ",";
      if (withSources) {
        out += "\"source\":";
        appendJson(out, capture.source);
        out += ',';
      }
      out += "\"offset\":";
      appendNumber(out, finding.offset);
      out += ",\"reason\":";
      appendJson(out, finding.reason);
      out += '}';
    }
  }
  out += ']';
  if (further != 0) {
    out.append(",\"further_").append(member).append("\":");
    appendNumber(out, further);
  }
}

class Json : public View {
 public:
  using View::View;

  void begin(Capture& capture) override {
    hasRecords_ = false;
    std::string& out = sink_.text;
    out += "{\"source\":";
    appendJson(out, capture.source);
    out.append(",\"kind\":\"").append(kindName(capture.kind)).append("\",\"bytes\":");
    appendNumber(out, capture.bytes.size());
    out += ",\"records\":[";
  }

  void records(std::span<const Record> records) override {
    Appender appender(sink_);
    for (const Record& record : records) {
      if (std::exchange(hasRecords_, true)) appender.text(kBetween);
      if (record.isListed) {
        const Head& head = headOf(record);
        appender.shortText(head.text, head.size);
      } else {
        std::string head;
        appendHead(head, record);
        appender.text(head);
      }
      appender.list(record.values);
    }
  }

  void end(Capture& capture) override {
    if (hasRecords_) sink_.text += "]}";
    sink_.text += "],";
    appendFindings(sink_.text, "findings", {&capture, 1});
    sink_.text += "}\n";
  }

  void difference(const Series& series) override {
    const std::span<const Capture> captures = series.captures();
    std::string& out = sink_.text;
    out += "{\"old\":";
    appendJson(out, captures.front().source);
    out += ",\"new\":";
    appendJson(out, captures.back().source);
    out.append(",\"kind\":\"").append(kindName(series.kind())).append("\",\"changes\":[");
    const char* separator = "";
    for (const size_t track : series.tracksInOrder()) {
      const Track& about = series.tracks()[track];
      openTrack(std::exchange(separator, ","), about);
      addList("old", about.elements, [&](uint32_t i) { return series.value(track, 0, i); });
      addList("new", about.elements, [&](uint32_t i) { return series.value(track, 1, i); });
      addList("delta", about.elements, [&](uint32_t i) { return series.delta(track, i); });
      out += '}';
    }
    out += "],";
    appendFindings(out, "old_findings", captures.first(1));
    out += ',';
    appendFindings(out, "new_findings", captures.last(1));
    out += "}\n";
  }

  void trend(const Series& series) override {
    std::string& out = sink_.text;
    out.append("{\"kind\":\"").append(kindName(series.kind())).append("\",\"sources\":[");
    for (size_t point = 0; point < series.points(); ++point) {
      if (point != 0) out += ',';
      appendJson(out, series.captures()[point].source);
    }
    out += "],\"over\":";
    if (const Over* over = series.over()) {
      out += "{\"name\":";
      appendJson(out, over->name);
      out += ",\"values\":[";
      for (size_t point = 0; point < over->values.size(); ++point) {
        if (point != 0) out += ',';
        appendNumber(out, over->values[point]);
      }
      out += "]}";
    } else {
      out += "null";
    }
    out += ",\"series\":[";
    const char* separator = "";
    for (const size_t track : series.tracksInOrder()) {
      const Track& about = series.tracks()[track];
      openTrack(std::exchange(separator, ","), about);
      out += ",\"values\":[";
      for (size_t point = 0; point < series.points(); ++point) {
        if (point != 0) out += ',';
        addPoint(about, series.values(track, point));
      }
      out += "]}";
      sink_.offer();
    }
    out += "],";
    appendFindings(out, "findings", series.captures(), true);
    out += "}\n";
  }

  void listing(const Listing& listing) override {
    std::string& out = sink_.text;
    for (const auto& row : listing.rows) {
      for (size_t i = 0; i < row.size(); ++i) {
        out += i == 0 ? '{' : ',';
        appendJson(out, listing.columns[i].name);
        out += ':';
        if (const auto* number = std::get_if<uint64_t>(&row[i])) {
          appendNumber(out, *number);
        } else {
          appendJson(out, std::get<std::string>(row[i]));
        }
      }
      out += '}';
      endLine();
    }
  }

  [[nodiscard]] bool showsFindings() const override { return true; }

 private:
  /// Opens the object of a track, its key and name told.
  void openTrack(const char* separator, const Track& track) {
    std::string& out = sink_.text;
    out.append(separator).append("{\"key\":");
    appendNumber(out, track.key);
    out += ",\"name\":";
    appendJson(out, track.name);
  }

  template <class ValueAt>
  void addList(const char* member, uint32_t count, ValueAt valueAt) {
    std::string& out = sink_.text;
    out.append(",\"").append(member).append("\":[");
    for (uint32_t i = 0; i < count; ++i) {
      const auto value = valueAt(i);
      out.append(i == 0 ? "" : ",").append(value ? Wide(*value).text() : "null");
      sink_.offer();
    }
    out += ']';
  }

  /// A track at a point: a number or, of an array, a list; null where it is missing.
  void addPoint(const Track& track, const Values& values) {
    std::string& out = sink_.text;
    if (values.empty()) {
      out += "null";
      return;
    }
    if (track.isArray) out += '[';
    for (uint32_t i = 0; i < values.size(); ++i) {
      if (i != 0) out += ',';
      appendNumber(out, values[i]);
      sink_.offer();
    }
    if (track.isArray) out += ']';
  }

  static constexpr std::string_view kBetween = "]},";

  /// What stands in front of a record's values.
  static void appendHead(std::string& out, const Record& record) {
    out += "{\"key\":";
    appendNumber(out, record.key);
    out += ",\"name\":";
    appendJson(out, record.name);
    out += ",\"values\":[";
  }

  static constexpr std::string_view kLongestAround = R"({"key":4294967295,"name":"","values":[)";
  static_assert(kLongestAround.size() + ksp::KeyName::kRoom <= Appender::kShort);

  /// That of a listed key, kept for the next capture.
  struct Head {
    uint32_t key = 0;
    uint32_t size = 0;
    char text[Appender::kShort] = {};
  };

  const Head& headOf(const Record& record) {
    Head& head = heads_[record.key % heads_.size()];
    if (head.size == 0 || head.key != record.key) {
      std::string text;
      appendHead(text, record);
      head.key = record.key;
      head.size = static_cast<uint32_t>(text.copy(head.text, sizeof head.text));
    }
    return head;
  }

  bool hasRecords_ = false;
  std::array<Head, 1024> heads_;
};

}  // namespace

std::unique_ptr<View> makeJson(const ViewOptions& /*options*/, Sink& sink) {
  return std::make_unique<Json>(sink);
}

}  // namespace kspdump
