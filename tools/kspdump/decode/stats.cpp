// SPDX-License-Identifier: Apache-2.0
// The statistics stream, and the summary block that is copied from it.

#include <map>

#include "ksp/summary.hpp"
#include "tools/kspdump/decode/stream.h"

namespace kspdump {

using std::to_string;

void decodeStats(const Decoding& decoding, Capture& capture, Collector& collector) {
  const Bytes bytes = capture.bytes;
  ksp::StatisticsRecords records(
      bytes.data(), bytes.size(), ksp::StatisticsFraming::kMarked,
      decoding.byNumber ? ksp::StatisticsNaming::kByNumber : ksp::StatisticsNaming::kByTable);
  capture.share = walk(records, bytes, kStatsWords, [&](const ksp::Record& record) {
    findSize(capture, record, kStatsWords);
    collect(collector, record, valuesOf(bytes, record, kStatsWords));
  });
  findEnd(capture, records.ending(), kStatsWords);
}

/// Of the statistics that the summary block copies, the last record each, as the block has them.
void decodeSummary(const Decoding& /*decoding*/, Capture& capture, Collector& collector) {
  constexpr uint8_t kLowBytes = 4;
  std::map<uint32_t, Record> lastOfKey;
  ksp::StatisticsRecords records(capture.bytes.data(), capture.bytes.size());
  capture.share = walk(records, capture.bytes, kStatsWords, [&](const ksp::Record& record) {
    const ksp::SummaryField* const field = ksp::findSummaryField(record.key);
    const bool isCopied = field != nullptr || record.key == ksp::kReadCountHisto;
    if (!isCopied || record.row == nullptr) return;
    findSize(capture, record, kStatsWords);
    Values values = valuesOf(capture.bytes, record, kStatsWords);
    if (field != nullptr && field->low != nullptr) {
      const Values low(capture.bytes.data() + record.offset + kStatsWords.headerSize, 1, kLowBytes,
                       kLowBytes);
      if (low[0] != values[0]) {
        capture.find(record.offset, std::string(record.row->name) + "(" + to_string(record.key) + ") is " +
                                        to_string(values[0]) + ", of which the summary keeps 32 bits");
      }
      values = low;
    }
    lastOfKey[record.key] = {record.offset, record.key, field == nullptr, true, record.row->name, values};
  });
  findEnd(capture, records.ending(), kStatsWords);
  for (const auto& [key, last] : lastOfKey) collector.add(last);
}

}  // namespace kspdump
