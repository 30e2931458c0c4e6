// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <string>

#include "ksp/records.hpp"
#include "tools/kspdump/decode/decode.h"

namespace kspdump {

/// How a stream is spoken of.
struct StreamWords {
  uint32_t headerSize;
  const char* header;
  /// What a header announces, and the bytes that one of these takes.
  const char* unit;
  uint32_t unitSize;
  /// The record that ends the stream.
  const char* end;
};

inline constexpr StreamWords kStatsWords = {ksp::StatisticsRecords::kWordSize, "word", "value",
                                            ksp::StatisticsRecords::kWordSize, "end marker"};
inline constexpr StreamWords kMediaWords = {ksp::MediaRecords::kHeaderSize, "record's header", "byte", 1,
                                            "end record"};

/// A record's elements, as `record` has them.
inline Values valuesOf(Bytes bytes, const ksp::Record& record, const StreamWords& words) {
  const auto width = static_cast<uint8_t>(record.elements.width());
  return {bytes.data() + record.offset + words.headerSize, record.elements.size(), width, width};
}

/// The end of the zeros that a capture is filled up with from `offset` on.
inline uint64_t endOfZeros(Bytes bytes, uint64_t offset) {
  const auto first = bytes.begin() + static_cast<std::ptrdiff_t>(offset);
  return static_cast<uint64_t>(
      std::find_if(first, bytes.end(), [](unsigned char byte) { return byte != 0; }) - bytes.begin());
}

/// Where the record that ended a stream itself ends. One that announces more than there is ends behind its
/// header.
inline uint64_t behindEnd(Bytes bytes, const ksp::Ending& ending, const StreamWords& words) {
  const uint64_t header = ending.offset + words.headerSize;
  const uint64_t announced = uint64_t{ending.announced} * words.unitSize;
  return announced <= bytes.size() - header ? header + announced : header;
}

/// Walks a stream that nothing else refers to, so that the walk stays in registers: hands each record that
/// counts to `each`, and measures how much of it is known.
template <class Stream, class Each>
Share walk(Stream& records, Bytes bytes, const StreamWords& words, Each each) {
  Share share = {.of = bytes.size()};
  for (const ksp::Record& record : records) {
    const bool isFiller = !record.counts && record.announced != 0;
    if (record.announced == 0 && record.key == 0) {
      share.of -= words.headerSize;
    } else if (isFiller) {
      share.recognised += words.headerSize + uint64_t{record.announced} * words.unitSize;
    } else if (record.row != nullptr) {
      const uint32_t limit = std::min(record.announced, record.configured);
      share.recognised += words.headerSize + uint64_t{limit} * words.unitSize;
    }
    if (record.counts) each(record);
  }
  const ksp::Ending ending = records.ending();
  if (ending.reason == ksp::EndReason::kEndMarker) {
    const uint64_t behind = behindEnd(bytes, ending, words);
    share.recognised += behind - ending.offset;
    share.of -= endOfZeros(bytes, behind) - behind;
  } else if (ending.reason == ksp::EndReason::kTail) {
    share.of -= endOfZeros(bytes, ending.offset) - ending.offset;
  }
  return share;
}

/// Bytes of a record without a row that fill no element.
inline uint64_t leftOver(const ksp::Record& record, const StreamWords& words) {
  if (record.row != nullptr) return 0;
  return uint64_t{record.announced} * words.unitSize % record.elements.width();
}

/// Names what is wrong with a record's size; of a copy, so that the walk's own stays in registers.
void tellSize(Capture& capture, ksp::Record record, const StreamWords& words);

/// Names a record that has not the size that its key is configured with, and bytes that fill no element.
inline void findSize(Capture& capture, const ksp::Record& record, const StreamWords& words) {
  if (!record.isAsConfigured() || leftOver(record, words) != 0) tellSize(capture, record, words);
}

/// Names what ended a walk before the capture's last byte, and bytes behind the end that may hide something.
void findEnd(Capture& capture, ksp::Ending ending, const StreamWords& words);

/// Hands on a record under its name.
inline void collect(Collector& collector, const ksp::Record& record, const Values& values) {
  if (values.empty()) return;
  if (record.isListed()) {
    collector.add({record.offset, record.key, record.isArray, true, record.row->name, values});
  } else {
    collector.addNumbered({record.offset, record.key, record.isArray, false, {}, values}, record.stem);
  }
}

}  // namespace kspdump
