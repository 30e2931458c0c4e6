#include "tools/kspdump/render.h"

#include <algorithm>

#include "tools/kspdump/text.h"

namespace kspdump {

namespace {

constexpr size_t kGap = 2;
/// The widest that a name makes its column.
constexpr size_t kWidestName = 34;

void pad(std::string& out, size_t have, size_t want) {
  out.append(want > have ? want - have : 0, ' ');
}

std::string decimal(Wide number) {
  std::string text;
  appendNumber(text, number);
  return text;
}

}  // namespace

void renderBars(std::string& out, const std::vector<Wide>& values, size_t width) {
  static constexpr const char* kBlocks[] = {"·", "▁", "▂", "▃", "▄", "▅", "▆", "▇", "█"};
  static constexpr const char* kAscii[] = {"_", ".", ":", "-", "=", "+", "*", "#", "@"};
  constexpr int kLevels = 8;
  const auto& levels = localeIsUtf8() ? kBlocks : kAscii;
  const Wide largest = values.empty() ? 0 : *std::max_element(values.begin(), values.end());
  const size_t bars = std::min(values.size(), width);
  for (size_t bar = 0; bar < bars; ++bar) {
    // Where there are more values than columns, each column shows the largest of its share.
    const auto first = values.begin() + static_cast<std::ptrdiff_t>(bar * values.size() / bars);
    const auto last = values.begin() + static_cast<std::ptrdiff_t>((bar + 1) * values.size() / bars);
    const Wide value = *std::max_element(first, last);
    const Wide level = value == 0 ? 0 : 1 + (value * kLevels - 1) / largest;
    out += levels[static_cast<size_t>(std::min<Wide>(level, kLevels))];
  }
}

namespace {

/// Appends a capture as a table for people.
void renderTable(std::string& out, const Capture& capture, size_t width) {
  out += printable(capture.source) + ": " + std::string(kindTitle(capture.kind)) + ", " +
         std::to_string(capture.bytes) + " bytes, " + std::to_string(capture.recordCount) +
         (capture.kind == Kind::kSnapshot ? " fields" : " records");
  if (capture.records.size() != capture.recordCount) {
    out += ", " + std::to_string(capture.records.size()) + " shown";
  }
  out += '\n';
  if (capture.records.empty()) return;

  size_t keyWidth = 5;
  size_t nameWidth = 4;
  size_t valueWidth = 9;
  for (const Record& record : capture.records) {
    keyWidth = std::max(keyWidth, std::to_string(record.key).size());
    nameWidth = std::max(nameWidth, recordName(record).size());
    valueWidth = std::max(valueWidth, decimal(capture.sum(record)).size());
  }
  nameWidth = std::min(nameWidth, kWidestName);
  const size_t used = keyWidth + nameWidth + valueWidth + 3 * kGap;
  const size_t barWidth = width > used + kLeastBars ? width - used : kLeastBars;

  pad(out, 3, keyWidth);
  out += "KEY  NAME";
  pad(out, 4, nameWidth + kGap + valueWidth - 9);
  out += "VALUE/SUM  ELEMENTS\n";
  std::vector<Wide> elements;
  for (const Record& record : capture.records) {
    const std::string key = std::to_string(record.key);
    const std::string name = printable(recordName(record));
    const std::string sum = decimal(capture.sum(record));
    pad(out, key.size(), keyWidth);
    out.append(key).append(kGap, ' ').append(name);
    pad(out, name.size(), nameWidth);
    out.append(kGap, ' ');
    pad(out, sum.size(), valueWidth);
    out += sum;
    if (record.isArray) {
      out.append(kGap, ' ');
      elements.assign(capture.valuesOf(record), capture.valuesOf(record) + record.valueCount);
      renderBars(out, elements, barWidth);
    }
    out += '\n';
  }
}

}  // namespace

void renderJsonFindings(std::string& out, std::string_view member, const Capture& capture) {
  out.append("\"").append(member).append("\":[");
  for (const Finding& finding : capture.findings) {
    if (&finding != capture.findings.data()) out += ',';
    out += "{\"offset\":";
    appendNumber(out, finding.offset);
    out += ",\"reason\":";
    appendJson(out, finding.reason);
    out += '}';
  }
  out += ']';
  if (capture.furtherFindings != 0) {
    out.append(",\"further_").append(member).append("\":");
    appendNumber(out, capture.furtherFindings);
  }
}

namespace {

/// Appends records to a capture's JSON document, behind others where it has some.
void renderJsonRecords(std::string& out, const Capture& capture, bool behindOthers) {
  Appender appender(out);
  std::string_view before = behindOthers ? ",{\"key\":" : "{\"key\":";
  std::string name;
  for (const Record& record : capture.records) {
    appender.text(before);
    before = "]},{\"key\":";
    appender.number(record.key);
    // Statistics have plain names; the labels of a snapshot's fields come from the device.
    if (capture.kind == Kind::kSnapshot) {
      name.clear();
      appendJson(name, record.name);
      appender.text(",\"name\":");
      appender.text(name);
    } else {
      appender.text(",\"name\":\"");
      appender.text(record.name.empty() ? recordName(record) : record.name);
      appender.text("\"");
    }
    appender.text(",\"values\":[");
    const uint64_t* values = capture.valuesOf(record);
    for (size_t i = 0; i < record.valueCount; ++i) {
      if (i != 0) appender.text(",");
      appender.number(values[i]);
    }
  }
  if (!capture.records.empty()) appender.text("]}");
  appender.flush();
}

void renderJsonHead(std::string& out, const Capture& capture) {
  out += "{\"source\":";
  appendJson(out, capture.source);
  out.append(",\"kind\":\"").append(kindName(capture.kind)).append("\",\"bytes\":");
  appendNumber(out, capture.bytes);
  out += ",\"records\":[";
}

/// Appends a capture as CSV rows, a value each.
void renderCsv(std::string& out, const Capture& capture) {
  std::string head;
  appendCsv(head, capture.source);
  head.append(",").append(kindName(capture.kind)).append(",");
  Appender appender(out);
  std::string name;
  for (const Record& record : capture.records) {
    name.clear();
    appendCsv(name, record.name.empty() ? recordName(record) : record.name);
    const uint64_t* values = capture.valuesOf(record);
    for (size_t i = 0; i < record.valueCount; ++i) {
      appender.text(head);
      appender.number(record.key);
      appender.text(",");
      appender.text(name);
      appender.text(",");
      if (record.isArray) appender.number(i);
      appender.text(",");
      appender.number(values[i]);
      appender.text("\n");
    }
  }
  appender.flush();
}

}  // namespace

void CaptureRenderer::part(Capture& capture) {
  if (format_ != Format::kJson && format_ != Format::kCsv) return;
  if (format_ == Format::kCsv) {
    renderCsv(out_, capture);
  } else {
    if (!isBegun_) renderJsonHead(out_, capture);
    renderJsonRecords(out_, capture, hasRecords_);
  }
  isBegun_ = true;
  hasRecords_ |= !capture.records.empty();
  capture.records.clear();
  capture.values.clear();
}

void CaptureRenderer::end(Capture& capture) {
  part(capture);
  if (format_ == Format::kTable) renderTable(out_, capture, width_);
  if (format_ != Format::kJson) return;
  out_ += "],";
  renderJsonFindings(out_, "findings", capture);
  out_ += "}\n";
}

namespace {

/// Words that the linters of metric names take for a unit, a type or a suffix with a meaning of its own.
constexpr std::string_view kReservedWords[] = {
    "b",  "bits",      "bucket", "count", "counter", "created", "d",     "days",    "gauge", "gb",
    "h",  "histogram", "hours",  "info",  "kb",      "m",       "mb",    "minutes", "ms",    "ns",
    "pb", "s",         "sec",    "sum",   "summary", "tb",      "total", "us",      "weeks"};

/// A statistic's name in the alphabet and the style of metric names: hostWriteLogHisto becomes
/// host_write_log_histo. A reserved word is joined to the one before it: powerOnHours becomes power_onhours.
std::string snakeCase(std::string_view name) {
  // The locale has no say in this.
  const auto isUpper = [&](size_t i) { return i < name.size() && name[i] >= 'A' && name[i] <= 'Z'; };
  const auto isLower = [&](size_t i) { return i < name.size() && name[i] >= 'a' && name[i] <= 'z'; };
  const auto isWord = [&](size_t i) {
    return isUpper(i) || isLower(i) || (name[i] >= '0' && name[i] <= '9');
  };
  std::string snake;
  std::string word;
  const auto endWord = [&] {
    const bool isReserved =
        std::find(std::begin(kReservedWords), std::end(kReservedWords), word) != std::end(kReservedWords);
    if (snake.empty()) {
      snake = isReserved ? word + "value" : word;
    } else if (!word.empty()) {
      snake.append(isReserved ? "" : "_").append(word);
    }
    word.clear();
  };
  for (size_t i = 0; i < name.size(); ++i) {
    const bool startsWord = isUpper(i) && i > 0 && (!isUpper(i - 1) || isLower(i + 1));
    if (startsWord || !isWord(i)) endWord();
    if (isWord(i)) word += static_cast<char>(isUpper(i) ? name[i] - 'A' + 'a' : name[i]);
  }
  endWord();
  return snake;
}

/// A text as UTF-8 in which what would end it, and each of `also`, is escaped.
std::string escaped(std::string_view text, std::string_view also) {
  std::string out;
  for (const char c : utf8(text)) {
    if (c == '\n') {
      out += "\\n";
      continue;
    }
    if (c == '\\' || also.find(c) != std::string_view::npos) out += '\\';
    out += c;
  }
  return out;
}

}  // namespace

bool OpenMetrics::add(Kind kind, const Record& record, std::string_view suffix, const std::string& source,
                      std::span<const std::optional<Wide>> values) {
  // The summary's fields are statistics of that name.
  const std::string_view family = kindName(kind == Kind::kSummary ? Kind::kStats : kind);
  const std::string_view name = record.name.empty() ? "undefined" : record.name;
  std::string metricName = "ksp_" + std::string(family) + "_" + snakeCase(name) + std::string(suffix);
  const auto [metricAt, isNewMetric] = metricsByName_.try_emplace(metricName, metrics_.size());
  if (isNewMetric) metrics_.push_back({std::move(metricName), escaped(name, ""), {}, {}});
  const auto [sourceAt, isNewSource] = sourcesByName_.try_emplace(source, sources_.size());
  if (isNewSource) sources_.push_back(escaped(source, "\""));

  Metric& metric = metrics_[metricAt->second];
  const size_t from = sourceAt->second;
  const bool isFirst = metric.seen.insert(uint64_t{from} << 32 | record.key).second;
  if (!isFirst) {
    std::erase_if(metric.samples,
                  [&](const Sample& sample) { return sample.source == from && sample.key == record.key; });
  }
  for (uint32_t i = 0; i < values.size(); ++i) {
    if (values[i]) metric.samples.push_back({from, record.key, record.isArray, i, *values[i]});
  }
  return isFirst;
}

void OpenMetrics::add(Capture& capture) {
  std::vector<std::optional<Wide>> values;
  for (const Record& record : capture.records) {
    values.assign(capture.valuesOf(record), capture.valuesOf(record) + record.valueCount);
    if (!add(capture.kind, record, "", capture.source, values)) {
      capture.find(record.offset, printable(recordName(record)) + "(" + std::to_string(record.key) +
                                      ") comes again; its last record stands");
    }
  }
}

std::string OpenMetrics::text() const {
  std::string out;
  for (const Metric& metric : metrics_) {
    if (metric.samples.empty()) continue;
    out.append("# HELP ").append(metric.name).append(" The controller's ").append(metric.help).append(".\n");
    out.append("# TYPE ").append(metric.name).append(" gauge\n");
    for (const Sample& sample : metric.samples) {
      out.append(metric.name).append("{source=\"").append(sources_[sample.source]).append("\",key=\"");
      appendNumber(out, sample.key);
      if (sample.isElement) {
        out += "\",element=\"";
        appendNumber(out, sample.element);
      }
      out += "\"} ";
      appendNumber(out, sample.value);
      out += '\n';
    }
  }
  return out + "# EOF\n";
}

}  // namespace kspdump
