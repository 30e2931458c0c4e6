#include "tools/kspdump/decode.h"

#include <fnmatch.h>

#include <algorithm>
#include <cstring>

#include "context/append.h"
#include "ksp/entries.hpp"
#include "ksp/statistics.h"
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
  Collector(Capture& capture, const std::string& match) : capture_(capture), match_(match) {}

  template <class ValueAt>
  void add(uint64_t offset, uint32_t key, std::string_view name, bool isArray, size_t count,
           ValueAt valueAt) {
    ++capture_.recordCount;
    const Record record = {offset, key, isArray, name, capture_.values.size(), count};
    if (!match_.empty() && fnmatch(match_.c_str(), recordName(record).c_str(), 0) != 0) return;
    capture_.records.push_back(record);
    for (uint32_t i = 0; i < count; ++i) capture_.values.push_back(valueAt(i));
  }

  void add(uint64_t offset, uint32_t key, std::string_view name, bool isArray,
           const ksp::Elements& elements) {
    add(offset, key, name, isArray, elements.count, [&](uint32_t i) { return elements[i]; });
  }

 private:
  Capture& capture_;
  const std::string& match_;
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
    capture.find(0, "there is no known statistic in it: is it a " + std::string(kindTitle(capture.kind)) +
                        " capture?");
  }
}

void decodeStats(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  Collector collector(capture, decoding.match);
  bool anyKnown = false;
  ksp::StatsWalk walk(bytes, static_cast<uint32_t>(capture.bytes), ksp::StatsFraming::kMarked);
  ksp::StatsRecord record;
  while (walk.next(record)) {
    const ksp::StatsKey* const known = ksp::findStatsKey(record.key);
    anyKnown |= known != nullptr;
    const ksp::StatsKey* const named = decoding.byNumber ? nullptr : known;
    if (named != nullptr && record.count != named->count) {
      findSize(capture, record.offset, named->name, record.key, record.count, named->count, "value");
    }
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

std::string_view statisticName(uint32_t key) {
  const ksp::StatsKey* const known = ksp::findStatsKey(key);
  return known == nullptr ? std::string_view() : std::string_view(known->name);
}

void decodeSummary(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  const auto length = static_cast<uint32_t>(capture.bytes);
  bool anyKnown = false;
  ksp::StatsWalk walk(bytes, length, ksp::StatsFraming::kUnmarked);
  ksp::StatsRecord record;
  while (walk.next(record)) anyKnown |= ksp::findStatsKey(record.key) != nullptr;
  findEnd(capture, walk.end(), record);
  findKind(capture, anyKnown);

  ksp::LegacyContext context;
  KSPParseBufferToCxt(context.get(), bytes, length);
  Collector collector(capture, decoding.match);
  for (const ksp::SummaryField& field : ksp::kSummaryFields) {
    collector.add(0, field.key, statisticName(field.key), false, 1,
                  [&](uint32_t) { return field.load(*context); });
  }
  collector.add(0, ksp::kReadCountHisto, statisticName(ksp::kReadCountHisto), true, ksp::kReadCounts,
                [&](uint32_t i) { return context->readCountHisto[i]; });
}

void decodeMedia(Capture& capture, const unsigned char* bytes, const Decoding& decoding) {
  using End = ksp::MSPEnd;
  Collector collector(capture, decoding.match);
  bool anyKnown = false;
  ksp::MSPWalk walk(bytes, static_cast<uint32_t>(capture.bytes));
  ksp::MSPRecord record;
  while (walk.next(record)) {
    const ksp::MSPKeyEntry* const known = ksp::LookupMSPKey(record.key);
    if (known == nullptr) continue;
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
  Collector collector(capture, decoding.match);
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
