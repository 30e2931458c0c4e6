#include "tools/kspdump/decode.h"

#include <fnmatch.h>

#include <algorithm>
#include <map>

#include "context/append.h"
#include "context/key_index.h"
#include "msp/key_table.h"
#include "msp/msp_walk.h"
#include "stats/key_table.h"
#include "stats/stats_walk.h"
#include "stats/summary.h"
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

  void add(uint64_t offset, uint32_t key, std::string_view name, bool isArray,
           const ksp::Elements& elements) {
    add(offset, key, name, isArray, elements.count, [&](uint32_t i) { return elements[i]; });
  }

 private:
  static constexpr size_t kManyRecords = 1 << 16;

  Capture& capture_;
  const Decoding& decoding_;
};

/// Names what ended a walk before the capture's last byte.
void findEnd(Capture& capture, ksp::StatsEnd end, const ksp::StatsRecord& at) {
  using End = ksp::StatsEnd;
  const uint64_t left = capture.bytes - at.offset;
  if (end == End::kTail) {
    capture.find(at.offset, counted(left, "byte") + " left over, fewer than a word");
  } else if (end == End::kInvalidKey) {
    capture.find(at.offset, "key " + to_string(at.key) + " is invalid, so the rest cannot be read");
  } else if (end == End::kOverrun) {
    capture.find(at.offset, "key " + to_string(at.key) + " announces " + counted(at.count, "value") +
                                ", but the capture ends after " + to_string(left / ksp::kStatsWordSize - 1));
  }
}

void findKind(Capture& capture, bool anyKnown) {
  if (capture.bytes == 0) {
    capture.find(0, "the capture is empty");
  } else if (!anyKnown) {
    capture.find(0, "there is no known statistic in it: is it a " +
                        std::string(capture.kind == Kind::kMedia ? "media " : "") + "statistics capture?");
  }
}

void findCount(Capture& capture, const ksp::StatsRecord& record, const ksp::StatsKey& key) {
  if (record.count != key.count) {
    findSize(capture, record.offset, key.name, record.key, record.count, key.count, "value");
  }
}

void decodeStats(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  Collector collector(capture, decoding);
  bool anyKnown = false;
  ksp::StatsWalk walk(bytes, static_cast<uint32_t>(capture.bytes), ksp::StatsFraming::kMarked);
  ksp::StatsRecord record;
  while (walk.next(record)) {
    const ksp::StatsKey* const known = ksp::findStatsKey(record.key);
    anyKnown |= known != nullptr;
    const ksp::StatsKey* const named = decoding.byNumber ? nullptr : known;
    if (known != nullptr) findCount(capture, record, *known);
    if (record.isEmpty()) continue;
    if (named == nullptr) {
      collector.add(record.offset, record.key, "", record.count > 1, record.elements(record.count));
    } else {
      collector.add(record.offset, record.key, named->name, named->isArray(), record.elements(named->count));
    }
  }
  findEnd(capture, walk.end(), record);
  findKind(capture, anyKnown);
}

/// Decodes the statistics that the summary block copies, of each the last record, as the block has them.
void decodeSummary(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  KSPParseContext summary = {};
  std::map<uint32_t, uint32_t> countOfKey;
  bool anyKnown = false;
  ksp::StatsWalk walk(bytes, static_cast<uint32_t>(capture.bytes), ksp::StatsFraming::kMarked);
  ksp::StatsRecord record;
  while (walk.next(record)) {
    const ksp::StatsKey* const known = ksp::findStatsKey(record.key);
    if (known == nullptr) continue;
    anyKnown = true;
    const ksp::SummaryField* const field = ksp::findByKey<ksp::kSummaryFields>(record.key);
    if (field == nullptr && record.key != ksp::kReadCountHisto) continue;
    findCount(capture, record, *known);
    if (record.isEmpty()) continue;
    const ksp::Elements elements = record.elements(known->count);
    countOfKey[record.key] = elements.count;
    for (uint32_t i = 0; field == nullptr && i < elements.count; ++i) summary.readCountHisto[i] = elements[i];
    if (field == nullptr) continue;
    field->store(summary, elements[0]);
    if (field->load(summary) != elements[0]) {
      capture.find(record.offset, std::string(known->name) + "(" + to_string(record.key) + ") is " +
                                      to_string(elements[0]) + ", of which the summary keeps 32 bits");
    }
  }
  findEnd(capture, walk.end(), record);
  findKind(capture, anyKnown);

  Collector collector(capture, decoding);
  for (const auto& [key, count] : countOfKey) {
    const ksp::SummaryField* const field = ksp::findByKey<ksp::kSummaryFields>(key);
    collector.add(0, key, ksp::findStatsKey(key)->name, field == nullptr, count, [&](uint32_t i) {
      return field == nullptr ? summary.readCountHisto[i] : field->load(summary);
    });
  }
}

void decodeMedia(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  using End = ksp::MSPEnd;
  Collector collector(capture, decoding);
  bool anyKnown = false;
  ksp::MSPWalk walk(bytes, static_cast<uint32_t>(capture.bytes));
  ksp::MSPRecord record;
  while (walk.next(record)) {
    const ksp::MSPKeyEntry* const known = ksp::LookupMSPKey(record.key);
    if (known == nullptr) {
      if (!record.isEmpty() && !record.isFiller()) collector.passOver();
      continue;
    }
    anyKnown = true;
    const uint32_t configured = uint32_t{known->count} * known->width;
    if (record.length != configured) {
      findSize(capture, record.offset, known->name, record.key, record.length, configured, "byte");
    }
    const ksp::Elements elements = {record.value, known->width,
                                    std::min<uint32_t>(record.length / known->width, known->count)};
    if (elements.count == 0) continue;
    collector.add(record.offset, record.key, known->name, known->count > 1, elements);
  }
  const uint64_t left = capture.bytes - record.offset;
  if (walk.end() == End::kTruncatedHeader) {
    capture.find(record.offset, counted(left, "byte") + " left over, fewer than a record's header");
  } else if (walk.end() == End::kOverrun) {
    capture.find(record.offset, "key " + to_string(record.key) + " announces " +
                                    counted(record.length, "byte") + ", but the capture ends after " +
                                    to_string(left - ksp::kMSPHeaderSize));
  }
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
