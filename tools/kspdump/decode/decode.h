// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <functional>
#include <span>
#include <string>
#include <vector>

#include "tools/kspdump/decode/capture.h"
#include "tools/kspdump/decode/selection.h"

namespace kspdump {

/// What to decode a capture as, and which of its records to hand on.
struct Decoding {
  Kind kind = Kind::kStats;
  /// Name statistics by their key number.
  bool byNumber = false;
  Selection selection;
  /// The snapshot's header; empty for the fixed layout.
  Bytes header;
};

/// Takes some of a capture's records, in their order; they are gone when it returns.
using TakeRecords = std::function<void(std::span<const Record>)>;

/// Decodes `capture.bytes` as far as they go, hands the selected records to `take`, some at a time, and names
/// whatever is wrong with them in the capture.
void decode(const Decoding& decoding, Capture& capture, const TakeRecords& take);

/// Counts and selects records, and hands them on some at a time.
class Collector {
 public:
  Collector(Capture& capture, const Decoding& decoding, const TakeRecords& take)
      : capture_(capture), selection_(decoding.selection), take_(take), used_(selection_.size()) {}
  Collector(const Collector&) = delete;
  Collector& operator=(const Collector&) = delete;

  /// A record whose name lasts.
  void add(uint64_t offset, uint32_t key, std::string_view name, bool isArray, const Values& values) {
    ++capture_.recordCount;
    if (!selection_.isEmpty() && !selection_.selects(name, key, used_)) return;
    ++capture_.shownCount;
    records_[count_++] = {offset, key, isArray, name, values};
    if (count_ == kBatch) handOn();
  }

  /// A record that is named by its key: `prefix`, of a few characters, and the number.
  void addNumbered(uint64_t offset, uint32_t key, std::string_view prefix, bool isArray,
                   const Values& values);

  /// Hands on the last records, and names what selected none.
  void finish();

 private:
  void handOn();

  static constexpr size_t kBatch = 256;
  static constexpr size_t kLongestNumbered = 24;

  Capture& capture_;
  const Selection& selection_;
  const TakeRecords& take_;
  std::vector<bool> used_;
  size_t count_ = 0;
  std::array<Record, kBatch> records_;
  std::array<char[kLongestNumbered], kBatch> names_;
};

/// A decoder for each kind; `decode` chooses.
void decodeStats(const Decoding& decoding, Capture& capture, Collector& collector);
void decodeSummary(const Decoding& decoding, Capture& capture, Collector& collector);
void decodeMedia(const Decoding& decoding, Capture& capture, Collector& collector);
void decodeSnapshot(const Decoding& decoding, Capture& capture, Collector& collector);

}  // namespace kspdump
