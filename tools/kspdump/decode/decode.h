// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <functional>
#include <span>
#include <string>
#include <vector>

#include "ksp/detail/key_name.hpp"
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

/// Records that are handed on at once: all of a usual capture's.
class Batch {
 public:
  Batch() = default;
  Batch(const Batch&) = delete;
  Batch& operator=(const Batch&) = delete;

  [[nodiscard]] std::span<const Record> records() const { return {records_.data(), count_}; }

 private:
  friend class Collector;

  static constexpr size_t kMost = 1024;

  size_t count_ = 0;
  std::array<Record, kMost> records_;
  std::array<ksp::KeyName, kMost> names_;
};

/// Decodes `capture.bytes` as far as they go, hands the selected records to `take`, a batch at a time, and
/// names whatever is wrong with them in the capture. The last ones are in `batch` still when it returns.
void decode(const Decoding& decoding, Capture& capture, Batch& batch, const TakeRecords& take);

/// Counts and selects records, and hands them on batch by batch.
class Collector {
 public:
  Collector(Capture& capture, const Decoding& decoding, Batch& batch, const TakeRecords& take)
      : capture_(capture),
        selection_(decoding.selection),
        batch_(batch),
        take_(take),
        used_(selection_.size()) {
    batch_.count_ = 0;
  }
  Collector(const Collector&) = delete;
  Collector& operator=(const Collector&) = delete;

  void add(const Record& record) {
    ++capture_.recordCount;
    if (!selection_.isEmpty() && !selection_.selects(record.name, record.key, used_)) return;
    ++capture_.shownCount;
    batch_.records_[batch_.count_++] = record;
    if (batch_.count_ == Batch::kMost) handOn();
  }

  /// A record that is named by its key: `stem` and the number behind it.
  void addNumbered(Record record, std::string_view stem) {
    ksp::KeyName& name = batch_.names_[batch_.count_];
    name.assign(stem, record.key);
    record.name = name;
    add(record);
  }

  /// Hands on the last records, and names what selected none.
  void finish();

 private:
  void handOn();

  Capture& capture_;
  const Selection& selection_;
  Batch& batch_;
  const TakeRecords& take_;
  std::vector<bool> used_;
};

/// A decoder for each kind; `decode` chooses.
void decodeStats(const Decoding& decoding, Capture& capture, Collector& collector);
void decodeSummary(const Decoding& decoding, Capture& capture, Collector& collector);
void decodeMedia(const Decoding& decoding, Capture& capture, Collector& collector);
void decodeSnapshot(const Decoding& decoding, Capture& capture, Collector& collector);

}  // namespace kspdump
