// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "ksp/detail/little_endian.hpp"

namespace kspdump {

using Bytes = std::span<const unsigned char>;

enum class Kind { kStats, kSummary, kMedia, kSnapshot };

/// The kind's name in machine-readable output, and what people call it.
std::string_view kindName(Kind kind);
std::string_view kindTitle(Kind kind);

/// A record's values where they lie in the capture: unsigned little-endian numbers of one width, at equal
/// distances. The capture's bytes outlive it.
class Values {
 public:
  Values() = default;
  /// `count` numbers of `width` bytes, 8 at most, each `stride` bytes behind the one before; negative strides
  /// go backwards.
  Values(const unsigned char* first, uint32_t count, uint8_t width, int16_t stride)
      : first_(first), count_(count), stride_(stride), width_(width) {}

  [[nodiscard]] uint32_t size() const { return count_; }
  [[nodiscard]] bool empty() const { return count_ == 0; }

  [[nodiscard]] uint64_t operator[](uint32_t i) const {
    return ksp::loadLittleEndian(address(i), size_t{width_});
  }

  /// Hands the values from `begin` to `end` to `take`, one after another.
  template <class Take>
  void forEach(uint32_t begin, uint32_t end, Take take) const {
    constexpr size_t kWord = sizeof(uint64_t);
    if (width_ == kWord && stride_ == kWord) {
      const unsigned char* const last = first_ + kWord * end;
      for (const unsigned char* at = first_ + kWord * begin; at != last; at += kWord) {
        take(ksp::loadLittleEndian<uint64_t>(at));
      }
    } else {
      for (uint32_t i = begin; i < end; ++i) take((*this)[i]);
    }
  }

  /// Copies the values to `bytes`, one behind the other. Returns them there, and leaves `bytes` behind them.
  Values copiedTo(unsigned char*& bytes) const {
    const unsigned char* const first = bytes;
    for (uint32_t i = 0; i < count_; ++i) bytes = std::copy_n(address(i), width_, bytes);
    return {first, count_, width_, width_};
  }
  /// How many these are.
  [[nodiscard]] size_t copiedSize() const { return size_t{count_} * width_; }

  /// One of the values alone.
  [[nodiscard]] Values only(uint32_t i) const { return {address(i), 1, width_, stride_}; }

  /// The values of the same field in a record that lies so far behind.
  [[nodiscard]] Values movedBy(std::ptrdiff_t bytes) const {
    return {first_ + bytes, count_, width_, stride_};
  }

 private:
  [[nodiscard]] const unsigned char* address(uint32_t i) const {
    return first_ + std::ptrdiff_t{stride_} * static_cast<std::ptrdiff_t>(i);
  }

  const unsigned char* first_ = nullptr;
  uint32_t count_ = 0;
  int16_t stride_ = 0;
  uint8_t width_ = 0;
};

/// One decoded record: a statistic, or a field of a snapshot's record.
struct Record {
  /// Of the record, in bytes from the capture's first.
  uint64_t offset;
  /// The statistic's, or the number of the snapshot's record.
  uint32_t key;
  bool isArray;
  /// Whether the name is a key table's: printable, the same for all records of the key, and there for good.
  bool isListed;
  /// One made from the key lives until the next records are handed out, any other as long as the capture.
  std::string_view name;
  Values values;
};

/// How much of a capture its kind recognises. Zeros that fill it up do not count.
struct Share {
  uint64_t recognised = 0;
  uint64_t of = 0;

  /// Rounded down; `of` is not 0.
  [[nodiscard]] unsigned percent() const {
    constexpr uint64_t kWhole = 100;
    return static_cast<unsigned>(recognised * kWhole / of);
  }
  [[nodiscard]] bool isEnough() const { return of != 0 && recognised >= of - recognised; }
};

/// "1 byte", "2 bytes".
std::string counted(uint64_t count, const char* noun);

/// Something about a capture that its reader must know.
struct Finding {
  uint64_t offset;
  std::string reason;
};

/// What was read, and what is to be said of it. The records are not kept: they are handed on as they are
/// decoded.
struct Capture {
  /// Findings that are kept; of the others there is a count.
  static constexpr size_t kMostFindings = 100;

  std::string source;
  Kind kind = Kind::kStats;
  /// Valid while the capture is shown.
  Bytes bytes;
  /// How many these were.
  uint64_t size = 0;
  /// The snapshot's header; empty for the fixed layout.
  Bytes header;
  /// Records in the capture, and those of them that are selected.
  uint64_t recordCount = 0;
  uint64_t shownCount = 0;
  Share share;
  std::vector<Finding> findings;
  /// Findings beyond the most that are kept.
  uint64_t furtherFindings = 0;
  /// What names of records refer to that stand in no key table.
  std::deque<std::string> labels;

  /// Forgets what was decoded.
  void clear();

  void find(uint64_t offset, std::string reason);
  [[nodiscard]] bool isClean() const { return findings.empty(); }
};

}  // namespace kspdump
