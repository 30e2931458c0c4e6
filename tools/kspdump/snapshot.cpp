#include "tools/kspdump/snapshot.h"

#include <algorithm>
#include <string>
#include <vector>

#include "ksp/snapshot.h"
#include "snapshot/field_format.h"
#include "snapshot/header.h"
#include "snapshot/legend.h"
#include "snapshot/record_layout.h"
#include "snapshot/triples.h"
#include "tools/kspdump/text.h"

namespace kspdump {

namespace {

using std::to_string;

/// More descriptors than any controller has, and few enough for their product with the records.
constexpr uint32_t kMostDescriptors = 4096;

/// How often the fields together may show a record's bytes; overlapping ones could multiply the output.
constexpr uint64_t kMostCoverings = 8;

/// A field of every record: its label, and its words' offsets from the record's start.
struct Field {
  std::string_view label;
  bool isArray;
  std::vector<uint64_t> words;
};

bool isShown(const ksp::SnapshotHeader& header, const ksp::FieldDescriptor& field) {
  return field.type <= ksp::kFieldTriples && header.holds(field) && ksp::formatIsSafe(field);
}

/// The bytes of a record that the header's fields show, those that several show counted for each.
uint64_t shownBytes(const ksp::SnapshotHeader& header) {
  uint64_t bytes = 0;
  for (uint32_t i = 0; i < header.descriptorCount(); ++i) {
    const ksp::FieldDescriptor field = header.descriptor(i);
    if (isShown(header, field)) bytes += field.type == ksp::kFieldTriples ? field.size : ksp::kWordBytes;
  }
  return bytes;
}

/// The fields of one layout; labels are taken from the formats that the report shows them with.
class Layout {
 public:
  explicit Layout(std::deque<std::string>& labels) : labels_(labels) {}

  void addFixed() {
    add(ksp::kBeforeHysteresis);
    add("TH", false, {ksp::kWordBytes * ksp::kHysteresis});
    add(ksp::kAfterHysteresis);
    addTriples("R", ksp::kWordBytes * ksp::kReadTriples, ksp::kPriorities);
    addTriples("W", ksp::kWordBytes * ksp::kWriteTriples, ksp::kPriorities);
  }

  void add(const ksp::SnapshotHeader& header) {
    for (uint32_t i = 0; i < header.descriptorCount(); ++i) {
      const ksp::FieldDescriptor field = header.descriptor(i);
      if (!isShown(header, field)) continue;
      std::string label = labelOf(field.format);
      if (field.type == ksp::kFieldTriples) {
        addTriples(label, field.offset, field.size / ksp::kTripleBytes);
      } else {
        add(label.empty() ? "field" + to_string(i) : std::move(label), false, {field.offset});
      }
    }
  }

  const std::vector<Field>& fields() const { return fields_; }

 private:
  /// The text in front of a format's number: "HR" of " HR=%4u".
  static std::string labelOf(std::string_view format) {
    constexpr std::string_view kAround = " =/";
    std::string_view label = format.substr(0, format.find('%'));
    label.remove_prefix(std::min(label.find_first_not_of(kAround), label.size()));
    label.remove_suffix(label.size() - (label.find_last_not_of(kAround) + 1));
    return std::string(label);
  }

  void add(std::string label, bool isArray, std::vector<uint64_t> words) {
    fields_.push_back({labels_.emplace_back(std::move(label)), isArray, std::move(words)});
  }

  template <size_t count>
  void add(const ksp::RecordField (&fields)[count]) {
    for (const ksp::RecordField& field : fields) {
      const std::string label = labelOf({field.format.prefix, field.format.prefixLength});
      // One without a label continues the field before it, as in "BF= 3/ 9".
      if (label.empty()) {
        fields_.back().isArray = true;
        fields_.back().words.push_back(ksp::kWordBytes * field.word);
      } else {
        add(label, false, {ksp::kWordBytes * field.word});
      }
    }
  }

  void addTriples(const std::string& label, uint64_t offset, uint32_t count) {
    for (const ksp::TripleColumn& column : ksp::kTripleColumns) {
      std::vector<uint64_t> words;
      for (uint64_t k = 0; k < count; ++k) words.push_back(offset + column.offset + ksp::kTripleBytes * k);
      add(label + column.letter, true, std::move(words));
    }
  }

  std::deque<std::string>& labels_;
  std::vector<Field> fields_;
};

/// Whether the first word of each of `count` records, at the offset that `keyAt` gives, is 0.
template <class KeyAt>
bool isUnused(Bytes records, uint64_t count, KeyAt keyAt) {
  for (uint64_t i = 0; i < count; ++i) {
    if (ksp::loadWord(records.data() + keyAt(i)) != 0) return false;
  }
  return true;
}

void reportFixed(Bytes records, const std::function<void(std::string_view)>& write) {
  constexpr uint64_t kChunk = 4096 * ksp::kRecordBytes;
  constexpr uint64_t kLongestLine = 1024;
  const uint64_t usable = records.size() / ksp::kRecordBytes * ksp::kRecordBytes;
  std::vector<char> text(ksp::kLegend.size() + std::min(kChunk, usable) / ksp::kRecordBytes * kLongestLine +
                         2);
  uint64_t done = 0;
  do {
    const uint64_t chunk = std::min(kChunk, usable - done);
    uint64_t size = text.size();
    KSPParseSnapshotBuffer(records.data() + done, chunk, text.data(), &size);
    std::string_view part(text.data(), size);
    // The legend goes before the first record and the empty line behind the last.
    if (done != 0) part.remove_prefix(ksp::kLegend.size());
    done += chunk;
    if (done < usable) part.remove_suffix(1);
    write(part);
  } while (done < usable);
}

void reportPages(Capture& capture, Bytes records, Bytes header,
                 const std::function<void(std::string_view)>& write) {
  constexpr size_t kGreatestPage = size_t{1} << 26;
  std::vector<char> page(size_t{1} << 18);
  uint32_t cursor = 0;
  for (int done = 0; done == 0;) {
    const uint32_t start = cursor;
    uint64_t size = page.size();
    done = KSPParseSnapshotBufferWithInplaceParser(records.data(), records.size(), page.data(), &size,
                                                   header.data(), &cursor);
    const bool isEmpty = size == 1;
    write({page.data(), size - 1});
    if (done != 0) break;
    // The line that did not fit opens the next page, or gets a larger one where it had this to itself.
    if (!isEmpty) {
      --cursor;
    } else if (page.size() < kGreatestPage) {
      page.resize(page.size() * 2);
      cursor = start;
    } else {
      const uint32_t lost = std::max(cursor, 1U) - 1;
      capture.find(ksp::SnapshotHeader(header.data()).recordOffset(lost),
                   "the line of record " + to_string(lost) + " is too long and left out");
      cursor = lost + 1;
    }
  }
}

}  // namespace

const char* headerFault(Bytes header) {
  if (const char* fault = ksp::snapshotHeaderFault(header.data(), header.size())) return fault;
  if (ksp::SnapshotHeader(header.data()).descriptorCount() > kMostDescriptors) {
    return "counts more than 4096 descriptors";
  }
  const ksp::SnapshotHeader reader(header.data());
  if (shownBytes(reader) > kMostCoverings * reader.recordSize())
    return "describes a record's bytes again and again";
  return nullptr;
}

void findSnapshotFaults(Capture& capture, Bytes records, Bytes header) {
  if (records.empty()) return capture.find(0, "the capture is empty");
  if (header.empty()) {
    const uint64_t left = records.size() % ksp::kRecordBytes;
    if (left != 0) {
      capture.find(records.size() - left, counted(left, "byte") + " left over, fewer than a record");
    }
    const uint64_t count = records.size() / ksp::kRecordBytes;
    if (isUnused(records, count, [](uint64_t i) { return i * ksp::kRecordBytes; })) {
      capture.find(0, "no record has a timestamp: is it a snapshot capture?");
    }
    return;
  }
  const ksp::SnapshotHeader reader(header.data());
  for (uint32_t i = 0; i < reader.descriptorCount(); ++i) {
    const ksp::FieldDescriptor field = reader.descriptor(i);
    if (field.type > ksp::kFieldTriples) {
      capture.find(
          0, "the header's descriptor " + to_string(i) + " has the unknown type " + to_string(field.type));
    } else if (!reader.holds(field)) {
      capture.find(0, "the header's descriptor " + to_string(i) + " lies outside the record");
    } else if (!ksp::formatIsSafe(field)) {
      capture.find(0,
                   "the header's descriptor " + to_string(i) + " has a format that its field does not suit");
    }
  }
  if (!reader.hasKey()) {
    capture.find(0, "the header describes no field by which a record could be known to be in use");
  } else if (const uint32_t end = reader.endOfRecords(records.size());
             isUnused(records, end, [&](uint64_t i) {
               return reader.recordOffset(static_cast<uint32_t>(i)) + reader.descriptor(0).offset;
             })) {
    capture.find(0, "no record is in use: is it a capture of this header's layout?");
  }
  const uint64_t announced = uint64_t{reader.recordSize()} * reader.recordCount();
  if (announced != records.size()) {
    capture.find(std::min<uint64_t>(announced, records.size()),
                 "the header counts " + counted(reader.recordCount(), "record") + " of " +
                     counted(reader.recordSize(), "byte") + ", the capture holds " +
                     counted(records.size(), "byte"));
  }
}

void decodeSnapshot(Capture& capture, Bytes records, Bytes header, const AddField& add) {
  Layout layout(capture.labels);
  const auto addRecord = [&](uint64_t offset, uint32_t record) {
    for (const Field& field : layout.fields()) add(offset, record, field.label, field.isArray, field.words);
  };
  if (header.empty()) {
    layout.addFixed();
    for (uint32_t i = 0; i < records.size() / ksp::kRecordBytes; ++i) addRecord(i * ksp::kRecordBytes, i);
    return;
  }
  const ksp::SnapshotHeader reader(header.data());
  const uint32_t end = reader.hasKey() ? reader.endOfRecords(records.size()) : 0;
  // The fields of records larger than the capture could be of any size.
  if (end == 0) return;
  layout.add(reader);
  for (uint32_t i = 0; i < end; ++i) {
    const uint32_t offset = reader.recordOffset(i);
    if (ksp::loadWord(records.data() + offset + reader.descriptor(0).offset) != 0) addRecord(offset, i);
  }
}

void reportSnapshot(Capture& capture, Bytes records, Bytes header,
                    const std::function<void(std::string_view)>& write) {
  if (header.empty()) {
    reportFixed(records, write);
  } else {
    reportPages(capture, records, header, write);
  }
}

}  // namespace kspdump
