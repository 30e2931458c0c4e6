#include "tools/kspdump/decode.h"

#include <fnmatch.h>

#include <map>

#include "ksp/records.hpp"
#include "ksp/summary.hpp"
#include "tools/kspdump/snapshot.h"
#include "tools/kspdump/text.h"

namespace kspdump {

namespace {

using std::to_string;

/// A record whose size is not the configured one is shown as far as it goes.
void findSize(Capture& capture, uint64_t offset, std::string_view name, uint32_t key, uint64_t size,
              uint64_t configured, const char* unit) {
  capture.find(offset, std::string(name) + "(" + to_string(key) + ") carries " + counted(size, unit) + ", " +
                           to_string(configured) + " configured");
}

class Collector {
 public:
  Collector(Capture& capture, const Decoding& decoding) : capture_(capture), decoding_(decoding) {}

  /// Counts a record that is not shown.
  void passOver() { ++capture_.recordCount; }

  template <class ValueAt>
  void add(uint64_t offset, uint32_t key, std::string_view name, bool isArray, size_t count,
           ValueAt valueAt) {
    ++capture_.recordCount;
    const Record record = {offset, key, isArray, name, capture_.values.size(), count};
    const std::string& match = decoding_.match;
    if (!match.empty() && fnmatch(match.c_str(), recordName(record).c_str(), 0) != 0) return;
    capture_.records.push_back(record);
    for (uint32_t i = 0; i < count; ++i) capture_.values.push_back(valueAt(i));
    if (capture_.records.size() >= kManyRecords) decoding_.whenMany(capture_);
  }

  void add(const ksp::Record& record) {
    add(record.offset, record.key, record.isListed() ? std::string_view(record.row->name) : "",
        record.isArray, record.elements.size(), [&](uint32_t i) { return record.elements[i]; });
  }

 private:
  static constexpr size_t kManyRecords = 1 << 16;

  Capture& capture_;
  const Decoding& decoding_;
};

/// Names what ended a walk before the capture's last byte; a header has `headerSize` bytes.
void findEnd(Capture& capture, const ksp::Ending& ending, const char* headerName, uint32_t headerSize,
             const char* unit, uint32_t unitSize) {
  using Reason = ksp::EndReason;
  const uint64_t left = capture.bytes - ending.offset;
  if (ending.reason == Reason::kTail) {
    capture.find(ending.offset, counted(left, "byte") + " left over, fewer than a " + headerName);
  } else if (ending.reason == Reason::kInvalidKey) {
    capture.find(ending.offset, "key " + to_string(ending.key) + " is invalid, so the rest cannot be read");
  } else if (ending.reason == Reason::kOverrun) {
    capture.find(ending.offset, "key " + to_string(ending.key) + " announces " +
                                    counted(ending.announced, unit) + ", but the capture ends after " +
                                    to_string((left - headerSize) / unitSize));
  }
}

void findStatsEnd(Capture& capture, const ksp::Ending& ending) {
  constexpr uint32_t kWord = ksp::StatisticsRecords::kWordSize;
  findEnd(capture, ending, "word", kWord, "value", kWord);
}

void findKind(Capture& capture, bool anyKnown) {
  if (capture.bytes == 0) {
    capture.find(0, "the capture is empty");
  } else if (!anyKnown) {
    capture.find(0, "there is no known statistic in it: is it a " +
                        std::string(capture.kind == Kind::kMedia ? "media " : "") + "statistics capture?");
  }
}

void findSize(Capture& capture, const ksp::Record& record, const char* unit) {
  if (record.isAsConfigured()) return;
  findSize(capture, record.offset, record.row->name, record.key, record.announced, record.configured, unit);
}

void decodeStats(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  Collector collector(capture, decoding);
  bool anyKnown = false;
  ksp::StatisticsRecords records(
      bytes, capture.bytes, ksp::StatisticsFraming::kMarked,
      decoding.byNumber ? ksp::StatisticsNaming::kByNumber : ksp::StatisticsNaming::kByTable);
  for (const ksp::Record& record : records) {
    anyKnown |= record.row != nullptr;
    findSize(capture, record, "value");
    if (record.counts) collector.add(record);
  }
  findStatsEnd(capture, records.ending());
  findKind(capture, anyKnown);
}

/// Decodes the statistics that the summary block copies, of each the last record, as the block has them.
void decodeSummary(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  KSPParseContext summary = {};
  std::map<uint32_t, uint32_t> countOfKey;
  bool anyKnown = false;
  ksp::StatisticsRecords records(bytes, capture.bytes);
  for (const ksp::Record& record : records) {
    if (record.row == nullptr) continue;
    anyKnown = true;
    const ksp::SummaryField* const field = ksp::findSummaryField(record.key);
    if (field == nullptr && record.key != ksp::kReadCountHisto) continue;
    findSize(capture, record, "value");
    if (!record.counts) continue;
    const ksp::Elements& elements = record.elements;
    countOfKey[record.key] = elements.size();
    for (uint32_t i = 0; field == nullptr && i < elements.size(); ++i) {
      summary.readCountHisto[i] = elements[i];
    }
    if (field == nullptr) continue;
    field->store(summary, elements[0]);
    if (field->load(summary) != elements[0]) {
      capture.find(record.offset, std::string(record.row->name) + "(" + to_string(record.key) + ") is " +
                                      to_string(elements[0]) + ", of which the summary keeps 32 bits");
    }
  }
  findStatsEnd(capture, records.ending());
  findKind(capture, anyKnown);

  Collector collector(capture, decoding);
  for (const auto& [key, count] : countOfKey) {
    const ksp::SummaryField* const field = ksp::findSummaryField(key);
    collector.add(0, key, ksp::findStatsKey(key)->name, field == nullptr, count, [&](uint32_t i) {
      return field == nullptr ? summary.readCountHisto[i] : field->load(summary);
    });
  }
}

void decodeMedia(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  Collector collector(capture, decoding);
  bool anyKnown = false;
  ksp::MediaRecords records(bytes, capture.bytes);
  for (const ksp::Record& record : records) {
    if (record.row == nullptr) {
      if (record.counts) collector.passOver();
      continue;
    }
    anyKnown = true;
    findSize(capture, record, "byte");
    if (!record.elements.empty()) collector.add(record);
  }
  findEnd(capture, records.ending(), "record's header", ksp::MediaRecords::kHeaderSize, "byte", 1);
  findKind(capture, anyKnown);
}

void decodeSnapshotFields(Capture& capture, Bytes bytes, const Decoding& decoding) {
  Collector collector(capture, decoding);
  findSnapshotFaults(capture, bytes, decoding.header);
  decodeSnapshot(capture, bytes, decoding.header,
                 [&](uint64_t offset, uint32_t record, std::string_view label, bool isArray, auto words) {
                   collector.add(offset, record, label, isArray, words.size(), [&](uint32_t i) {
                     return ksp::loadLittleEndian(bytes.data() + offset + words[i], 4);
                   });
                 });
}

}  // namespace

void decode(std::span<const unsigned char> bytes, const std::string& source, const Decoding& decoding,
            Capture& capture) {
  capture.clear();
  capture.source = source;
  capture.kind = decoding.kind;
  capture.bytes = bytes.size();
  switch (decoding.kind) {
    case Kind::kStats:
      decodeStats(capture, bytes.data(), decoding);
      break;
    case Kind::kSummary:
      decodeSummary(capture, bytes.data(), decoding);
      break;
    case Kind::kMedia:
      decodeMedia(capture, bytes.data(), decoding);
      break;
    case Kind::kSnapshot:
      decodeSnapshotFields(capture, bytes, decoding);
      break;
  }
}

}  // namespace kspdump
