#include "tools/kspdump/render.h"

#include <algorithm>
#include <cctype>
#include <nlohmann/json.hpp>
#include <optional>

#include "tools/kspdump/text.h"

namespace kspdump {

namespace {

constexpr size_t kKeyWidth = 5;
constexpr size_t kWidestName = 34;
constexpr size_t kGap = 2;
constexpr size_t kLeastBars = 8;

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

void renderTable(std::string& out, const Capture& capture, size_t width) {
  out += printable(capture.source) + ": " + std::string(kindTitle(capture.kind)) + ", " +
         std::to_string(capture.bytes) + " bytes, " + std::to_string(capture.recordCount) +
         (capture.kind == Kind::kSnapshot ? " fields" : " records");
  if (capture.records.size() != capture.recordCount) {
    out += ", " + std::to_string(capture.records.size()) + " shown";
  }
  out += '\n';
  if (capture.records.empty()) return;

  size_t nameWidth = 4;
  size_t valueWidth = 5;
  for (const Record& record : capture.records) {
    nameWidth = std::max(nameWidth, recordName(record).size());
    valueWidth = std::max(valueWidth, decimal(capture.sum(record)).size());
  }
  nameWidth = std::min(nameWidth, kWidestName);
  const size_t used = kKeyWidth + nameWidth + valueWidth + 3 * kGap;
  const size_t barWidth = width > used + kLeastBars ? width - used : kLeastBars;

  out += "  KEY  NAME";
  pad(out, 4, nameWidth + kGap + valueWidth - 5);
  out += "VALUE  ELEMENTS (VALUE IS THEIR SUM)\n";
  std::vector<Wide> elements;
  for (const Record& record : capture.records) {
    const std::string key = std::to_string(record.key);
    const std::string name = printable(recordName(record));
    const std::string sum = decimal(capture.sum(record));
    pad(out, key.size(), kKeyWidth);
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

/// Appends the records' part of a capture's JSON document.
void renderJsonRecords(std::string& out, const Capture& capture) {
  Appender appender(out);
  std::string_view before = "{\"key\":";
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
}

}  // namespace

void renderJson(std::string& out, const Capture& capture) {
  out += "{\"source\":";
  appendJson(out, capture.source);
  out.append(",\"kind\":\"").append(kindName(capture.kind)).append("\",\"bytes\":");
  appendNumber(out, capture.bytes);
  out += ",\"records\":[";
  renderJsonRecords(out, capture);
  out += "],";
  renderJsonFindings(out, "findings", capture);
  out += "}\n";
}

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
  const auto is = [&](size_t i, int (*kind)(int)) {
    return i < name.size() && kind(static_cast<unsigned char>(name[i])) != 0;
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
    const bool startsWord =
        is(i, std::isupper) && i > 0 && (!is(i - 1, std::isupper) || is(i + 1, std::islower));
    if (startsWord || !is(i, std::isalnum)) endWord();
    if (is(i, std::isalnum)) word += static_cast<char>(std::tolower(static_cast<unsigned char>(name[i])));
  }
  endWord();
  return snake;
}

/// A text as the value of a label or the help of a metric: UTF-8, with what would end it escaped.
std::string escaped(std::string_view text) {
  std::string json;
  appendJson(json, text);
  const auto valid = nlohmann::json::parse(json).get<std::string>();
  std::string out;
  for (const char c : valid) {
    if (c == '\n') {
      out += "\\n";
      continue;
    }
    if (c == '\\' || c == '"') out += '\\';
    out += c;
  }
  return out;
}

}  // namespace

bool OpenMetrics::add(std::string_view kind, std::string_view name, std::string_view suffix,
                      std::string_view source, uint32_t key, int64_t element, Wide value) {
  std::string metricName = "ksp_" + std::string(kind) + "_" + snakeCase(name) + std::string(suffix);
  const auto [known, isNew] = byName_.try_emplace(metricName, metrics_.size());
  if (isNew) metrics_.push_back({std::move(metricName), escaped(name), {}, {}});
  Metric& metric = metrics_[known->second];

  std::string labels = "source=\"" + escaped(source) + "\",key=\"" + std::to_string(key) + "\"";
  if (element >= 0) labels += ",element=\"" + std::to_string(element) + "\"";
  const auto [sample, isFirst] = metric.bySample.try_emplace(labels, metric.samples.size());
  if (isFirst) {
    metric.samples.emplace_back(std::move(labels), value);
  } else {
    metric.samples[sample->second].second = value;
  }
  return isFirst;
}

void OpenMetrics::add(Capture& capture) {
  // The summary's fields are statistics of that name.
  const std::string_view kind = kindName(capture.kind == Kind::kSummary ? Kind::kStats : capture.kind);
  for (const Record& record : capture.records) {
    const std::string_view name = record.name.empty() ? "undefined" : record.name;
    bool isFirst = true;
    for (size_t i = 0; i < record.valueCount; ++i) {
      isFirst &= add(kind, name, "", capture.source, record.key,
                     record.isArray ? static_cast<int64_t>(i) : -1, capture.valuesOf(record)[i]);
    }
    if (!isFirst) {
      capture.find(record.offset, recordName(record) + "(" + std::to_string(record.key) +
                                      ") comes again; its last record stands");
    }
  }
}

std::string OpenMetrics::text() const {
  std::string out;
  for (const Metric& metric : metrics_) {
    out.append("# HELP ").append(metric.name).append(" The controller's ").append(metric.help).append(".\n");
    out.append("# TYPE ").append(metric.name).append(" gauge\n");
    for (const auto& [labels, value] : metric.samples) {
      out.append(metric.name).append("{").append(labels).append("} ");
      appendNumber(out, value);
      out += '\n';
    }
  }
  return out + "# EOF\n";
}

}  // namespace kspdump
