// SPDX-License-Identifier: Apache-2.0
// Timed snapshots: the fixed layout, or one that a header describes.

#include "tools/kspdump/decode/snapshot.h"

#include <algorithm>
#include <string>
#include <vector>

#include "snapshot/field_format.h"
#include "snapshot/header.h"
#include "snapshot/record_layout.h"
#include "snapshot/triples.h"
#include "snapshot/word.h"
#include "tools/kspdump/decode/decode.h"

namespace kspdump {

namespace {

using std::to_string;

/// More descriptors than any controller has, and few enough for their product with the records.
constexpr uint32_t kMostDescriptors = 4096;

/// How often the fields together may show a record's bytes; overlapping ones could multiply the output.
constexpr uint64_t kMostCoverings = 8;

/// A field of every record: words at equal distances.
struct Field {
  std::string_view label;
  bool isArray;
  uint32_t offset;
  uint32_t count;
  int16_t stride;
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
    add("TH", ksp::kWordBytes * ksp::kHysteresis);
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
        add(label.empty() ? "field" + to_string(i) : std::move(label), field.offset);
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

  void add(std::string label, size_t offset) {
    fields_.push_back(
        {labels_.emplace_back(std::move(label)), false, static_cast<uint32_t>(offset), 1, ksp::kWordBytes});
  }

  template <size_t count>
  void add(const ksp::RecordField (&fields)[count]) {
    for (const ksp::RecordField& field : fields) {
      const std::string label = labelOf({field.format.prefix, field.format.prefixLength});
      if (!label.empty()) {
        add(label, ksp::kWordBytes * field.word);
        continue;
      }
      // One without a label continues the field before it, as in "BF= 3/ 9".
      Field& last = fields_.back();
      last.isArray = true;
      last.stride = static_cast<int16_t>(ksp::kWordBytes * field.word - last.offset);
      ++last.count;
    }
  }

  void addTriples(const std::string& label, size_t offset, uint32_t count) {
    for (const ksp::TripleColumn& column : ksp::kTripleColumns) {
      fields_.push_back({labels_.emplace_back(label + column.letter), true,
                         static_cast<uint32_t>(offset + column.offset), count, ksp::kTripleBytes});
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

/// Judges whether records can be what a controller wrote, from one to the next.
class Plausibility {
 public:
  /// Of a record in use: its timestamp.
  void takeTime(uint32_t time, uint64_t offset) {
    if (time < lastTime_ && ++falls_ > kMostFalls && secondFall_ == 0) secondFall_ = offset;
    lastTime_ = time;
  }
  /// A ring of slots wraps once.
  [[nodiscard]] bool isTimeSound() const { return falls_ <= kMostFalls; }
  void findFalls(Capture& capture) const {
    if (isTimeSound()) return;
    capture.find(secondFall_,
                 "the timestamps fall " + to_string(falls_) + " times, those of a snapshot once at most");
  }

  /// Where there was no operation, there was no latency.
  static bool areTriplesSound(const unsigned char* triples, size_t count) {
    for (; count > 0; --count, triples += ksp::kTripleBytes) {
      const uint32_t operations = ksp::loadWord(triples);
      const uint32_t total = ksp::loadWord(triples + ksp::kWordBytes);
      const uint32_t greatest = ksp::loadWord(triples + 2 * ksp::kWordBytes);
      if (operations == 0 && (total != 0 || greatest != 0)) return false;
    }
    return true;
  }

  static bool isPercent(uint32_t word) {
    constexpr uint32_t kWhole = 100;
    return word <= kWhole;
  }

 private:
  static constexpr unsigned kMostFalls = 1;

  uint32_t lastTime_ = 0;
  unsigned falls_ = 0;
  uint64_t secondFall_ = 0;
};

/// Measures records of the fixed layout; `plausibility` has then seen their times.
Share measureFixed(Bytes records, Plausibility& plausibility) {
  constexpr size_t kPercent = 1;
  constexpr size_t kLeastTags = 53;
  constexpr size_t kMostTags = 54;
  Share share = {.of = records.size()};
  for (uint64_t offset = 0; records.size() - offset >= ksp::kRecordBytes; offset += ksp::kRecordBytes) {
    const unsigned char* const record = records.data() + offset;
    const auto word = [&](size_t index) { return ksp::loadWord(record + ksp::kWordBytes * index); };
    const uint32_t time = word(0);
    if (time == 0) {
      if (std::all_of(record, record + ksp::kRecordBytes, [](unsigned char byte) { return byte == 0; })) {
        share.of -= ksp::kRecordBytes;
      }
      continue;
    }
    plausibility.takeTime(time, offset);
    const bool isSound =
        plausibility.isTimeSound() && Plausibility::isPercent(word(kPercent)) &&
        word(kLeastTags) <= word(kMostTags) &&
        Plausibility::areTriplesSound(record + ksp::kWordBytes * ksp::kWriteTriples, ksp::kPriorities) &&
        Plausibility::areTriplesSound(record + ksp::kWordBytes * ksp::kReadTriples, ksp::kPriorities);
    if (isSound) share.recognised += ksp::kRecordBytes;
  }
  return share;
}

void findFixedFaults(Capture& capture) {
  Plausibility plausibility;
  capture.share = measureFixed(capture.bytes, plausibility);
  const uint64_t left = capture.bytes.size() % ksp::kRecordBytes;
  if (left != 0) {
    capture.find(capture.bytes.size() - left, counted(left, "byte") + " left over, fewer than a record");
  }
  plausibility.findFalls(capture);
}

/// Names what is wrong with a header's descriptors and with what it says of the records.
void findHeaderFaults(Capture& capture, Bytes records, Bytes header) {
  if (records.empty()) return;
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

/// Whether the triples of a header's record can be what a controller wrote.
bool isSound(const ksp::SnapshotHeader& header, Bytes record) {
  for (uint32_t i = 0; i < header.descriptorCount(); ++i) {
    const ksp::FieldDescriptor field = header.descriptor(i);
    if (field.type != ksp::kFieldTriples || !header.holds(field)) continue;
    if (!Plausibility::areTriplesSound(record.data() + field.offset, field.size / ksp::kTripleBytes))
      return false;
  }
  return true;
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

Share recogniseSnapshot(Bytes bytes) {
  Plausibility plausibility;
  return measureFixed(bytes, plausibility);
}

void decodeSnapshot(const Decoding& decoding, Capture& capture, Collector& collector) {
  const Bytes records = capture.bytes;
  const Bytes header = decoding.header;
  Layout layout(capture.labels);
  const auto addRecord = [&](uint64_t offset, uint32_t record) {
    for (const Field& field : layout.fields()) {
      const unsigned char* const first = records.data() + offset + field.offset;
      collector.add({offset, record, field.isArray, false, field.label,
                     Values(first, field.count, ksp::kWordBytes, field.stride)});
    }
  };
  if (header.empty()) {
    findFixedFaults(capture);
    layout.addFixed();
    for (uint32_t i = 0; i < records.size() / ksp::kRecordBytes; ++i) addRecord(i * ksp::kRecordBytes, i);
    return;
  }
  findHeaderFaults(capture, records, header);
  const ksp::SnapshotHeader reader(header.data());
  const uint32_t end = reader.hasKey() ? reader.endOfRecords(records.size()) : 0;
  // The fields of records larger than the capture could be of any size.
  if (end == 0) return;
  layout.add(reader);
  Plausibility plausibility;
  const bool isTimed = !layout.fields().empty() && layout.fields().front().label == "T";
  for (uint32_t i = 0; i < end; ++i) {
    const uint32_t offset = reader.recordOffset(i);
    const uint32_t key = ksp::loadWord(records.data() + offset + reader.descriptor(0).offset);
    if (key == 0) continue;
    if (isTimed) plausibility.takeTime(key, offset);
    capture.share.of += reader.recordSize();
    if (plausibility.isTimeSound() && isSound(reader, records.subspan(offset))) {
      capture.share.recognised += reader.recordSize();
    }
    addRecord(offset, i);
  }
  plausibility.findFalls(capture);
}

}  // namespace kspdump
