// Comma-separated values: a row a value.

#include <optional>
#include <string>

#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

class Csv : public View {
 public:
  using View::View;

  void head() override { sink_.text += "source,kind,key,name,element,value\n"; }

  void begin(Capture& capture) override {
    front_.clear();
    appendCsv(front_, capture.source);
    front_.append(",").append(kindName(capture.kind)).append(",");
  }

  void records(std::span<const Record> records) override {
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

  void end(Capture& /*capture*/) override {}

  void difference(const Series& series) override {
    std::string& out = sink_.text;
    out += "source,kind,key,name,element,old,new,delta\n";
    for (const size_t track : series.tracksInOrder()) {
      if (!series.changes(track)) continue;
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
        out += '\n';
        sink_.offer();
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
      out += '\n';
      sink_.offer();
    }
  }

  [[nodiscard]] bool showsFindings() const override { return false; }

 private:
  template <class Number>
  void addOptional(const std::optional<Number>& number) {
    sink_.text.append(",").append(number ? Wide(*number).text() : "");
  }

  std::string front_;
};

}  // namespace

std::unique_ptr<View> makeCsv(const ViewOptions& /*options*/, Sink& sink) {
  return std::make_unique<Csv>(sink);
}

}  // namespace kspdump
