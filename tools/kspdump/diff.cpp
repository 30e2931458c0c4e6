#include "tools/kspdump/diff.h"

#include <algorithm>
#include <map>
#include <optional>

#include "tools/kspdump/text.h"

namespace kspdump {

namespace {

/// A record of which something changed, as an array where it was or is one; before or after are missing where
/// it came or went.
struct Change {
  Record record;
  const Record* before;
  const Record* after;
};

class Comparison {
 public:
  Comparison(const Capture& before, const Capture& after) : before_(before), after_(after) {
    std::map<std::pair<uint32_t, size_t>, const Record*> unmatched;
    std::map<uint32_t, size_t> seen;
    for (const Record& record : before.records) unmatched[{record.key, seen[record.key]++}] = &record;
    seen.clear();
    for (const Record& record : after.records) {
      const auto found = unmatched.find({record.key, seen[record.key]++});
      Change change = {record, nullptr, &record};
      if (found != unmatched.end()) {
        change.before = found->second;
        change.record.isArray |= change.before->isArray;
        unmatched.erase(found);
      }
      if (differs(change)) changes_.push_back(change);
    }
    for (const auto& [key, record] : unmatched) changes_.push_back({*record, record, nullptr});
  }

  const std::vector<Change>& changes() const { return changes_; }

  size_t elements(const Change& change) const {
    return std::max(change.before == nullptr ? 0 : change.before->valueCount,
                    change.after == nullptr ? 0 : change.after->valueCount);
  }

  std::optional<Wide> before(const Change& change, size_t i) const { return at(before_, change.before, i); }
  std::optional<Wide> after(const Change& change, size_t i) const { return at(after_, change.after, i); }
  std::optional<Wide> delta(const Change& change, size_t i) const {
    return difference(before(change, i), after(change, i));
  }

  std::optional<Wide> sumBefore(const Change& change) const { return sum(before_, change.before); }
  std::optional<Wide> sumAfter(const Change& change) const { return sum(after_, change.after); }

  static std::optional<Wide> difference(std::optional<Wide> before, std::optional<Wide> after) {
    if (!before || !after) return std::nullopt;
    return *after - *before;
  }

 private:
  static std::optional<Wide> at(const Capture& capture, const Record* record, size_t i) {
    if (record == nullptr || i >= record->valueCount) return std::nullopt;
    return capture.valuesOf(*record)[i];
  }

  static std::optional<Wide> sum(const Capture& capture, const Record* record) {
    if (record == nullptr) return std::nullopt;
    return capture.sum(*record);
  }

  bool differs(const Change& change) const {
    if (change.before == nullptr) return true;
    const uint64_t* old = before_.valuesOf(*change.before);
    const uint64_t* now = after_.valuesOf(*change.after);
    return !std::equal(old, old + change.before->valueCount, now, now + change.after->valueCount);
  }

  const Capture& before_;
  const Capture& after_;
  std::vector<Change> changes_;
};

std::string decimal(std::optional<Wide> number, const char* missing, bool withSign = false) {
  if (!number) return missing;
  std::string text = withSign && *number > 0 ? "+" : "";
  appendNumber(text, *number);
  return text;
}

void diffTable(std::string& out, const Comparison& comparison, size_t width) {
  constexpr size_t kNameColumn = 1;
  std::vector<std::vector<std::string>> rows = {{"KEY", "NAME", "OLD", "NEW", "DELTA"}};
  for (const Change& change : comparison.changes()) {
    const auto before = comparison.sumBefore(change);
    const auto after = comparison.sumAfter(change);
    rows.push_back({std::to_string(change.record.key), printable(recordName(change.record)),
                    decimal(before, "-"), decimal(after, "-"),
                    decimal(Comparison::difference(before, after), "-", true)});
  }
  std::vector<size_t> widths(rows[0].size());
  for (const auto& row : rows) {
    for (size_t i = 0; i < row.size(); ++i) widths[i] = std::max(widths[i], row[i].size());
  }
  size_t used = 0;
  for (const size_t column : widths) used += column + 2;
  // Names give way to the numbers and to a small picture; one that is longer widens its own line.
  constexpr size_t kLeastName = 16;
  const size_t wanted = used + kLeastBars;
  const size_t tooWide = wanted > width ? wanted - width : 0;
  const size_t spare = widths[kNameColumn] > kLeastName ? widths[kNameColumn] - kLeastName : 0;
  widths[kNameColumn] -= std::min(tooWide, spare);
  used -= std::min(tooWide, spare);

  std::vector<Wide> moves;
  for (size_t row = 0; row < rows.size(); ++row) {
    for (size_t i = 0; i < widths.size(); ++i) {
      const std::string& cell = rows[row][i];
      const std::string padding(cell.size() < widths[i] ? widths[i] - cell.size() : 0, ' ');
      out.append(i == 0 ? "" : "  ").append(i == kNameColumn ? cell + padding : padding + cell);
    }
    if (row == 0) {
      out += "  ELEMENTS";
    } else if (const Change& change = comparison.changes()[row - 1]; change.record.isArray) {
      moves.clear();
      for (size_t i = 0; i < comparison.elements(change); ++i) {
        const Wide delta = comparison.delta(change, i).value_or(0);
        moves.push_back(delta < 0 ? -delta : delta);
      }
      out += "  ";
      renderBars(out, moves, width > used + kLeastBars ? width - used : kLeastBars);
    }
    out += '\n';
  }
}

template <class ValueAt>
void appendList(std::string& out, const char* member, size_t count, ValueAt valueAt) {
  out.append(",\"").append(member).append("\":[");
  for (size_t i = 0; i < count; ++i) out.append(i == 0 ? "" : ",").append(decimal(valueAt(i), "null"));
  out += ']';
}

void diffJson(std::string& out, const Comparison& comparison) {
  for (const Change& change : comparison.changes()) {
    if (&change != comparison.changes().data()) out += ',';
    out += "{\"key\":" + std::to_string(change.record.key) + ",\"name\":";
    appendJson(out, recordName(change.record));
    const size_t count = comparison.elements(change);
    appendList(out, "old", count, [&](size_t i) { return comparison.before(change, i); });
    appendList(out, "new", count, [&](size_t i) { return comparison.after(change, i); });
    appendList(out, "delta", count, [&](size_t i) { return comparison.delta(change, i); });
    out += '}';
  }
}

void diffCsv(std::string& out, const Comparison& comparison, const std::string& source,
             std::string_view kind) {
  out += "source,kind,key,name,element,old,new,delta\n";
  for (const Change& change : comparison.changes()) {
    for (size_t i = 0; i < comparison.elements(change); ++i) {
      appendCsv(out, source);
      out.append(",").append(kind).append(",").append(std::to_string(change.record.key)).append(",");
      appendCsv(out, recordName(change.record));
      out.append(",").append(change.record.isArray ? std::to_string(i) : "");
      for (const auto& number :
           {comparison.before(change, i), comparison.after(change, i), comparison.delta(change, i)}) {
        out.append(",").append(decimal(number, ""));
      }
      out += '\n';
    }
  }
}

std::string diffOpenMetrics(const Comparison& comparison, const std::string& source, Kind kind) {
  OpenMetrics metrics;
  std::vector<std::optional<Wide>> deltas;
  for (const Change& change : comparison.changes()) {
    deltas.clear();
    for (size_t i = 0; i < comparison.elements(change); ++i) deltas.push_back(comparison.delta(change, i));
    metrics.add(kind, change.record, "_delta", source, deltas);
  }
  return metrics.text();
}

}  // namespace

std::string renderDiff(const Capture& before, const Capture& after, Format format, size_t width) {
  const Comparison comparison(before, after);
  const std::string_view kind = kindName(before.kind);
  std::string out;
  switch (format) {
    case Format::kTable:
      out = printable(before.source) + " -> " + printable(after.source) + ": " +
            std::to_string(comparison.changes().size()) + " changed\n";
      if (!comparison.changes().empty()) diffTable(out, comparison, width);
      break;
    case Format::kJson:
      out = "{\"old\":";
      appendJson(out, before.source);
      out += ",\"new\":";
      appendJson(out, after.source);
      out.append(",\"kind\":\"").append(kind).append("\",\"changes\":[");
      diffJson(out, comparison);
      out += "],";
      renderJsonFindings(out, "old_findings", before);
      out += ',';
      renderJsonFindings(out, "new_findings", after);
      out += "}\n";
      break;
    case Format::kCsv:
      diffCsv(out, comparison, after.source, kind);
      break;
    case Format::kOpenMetrics:
      out = diffOpenMetrics(comparison, after.source, after.kind);
      break;
  }
  return out;
}

}  // namespace kspdump
