#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "context/append.h"
#include "context/little_endian.h"
#include "context/record_cursor.h"

namespace ksp {

/// Bytes of the words that make up a stream: a record is a header word and its values, a word each.
inline constexpr uint32_t kStatsWordSize = 8;
/// Greatest key that a header can have.
inline constexpr uint32_t kGreatestStatsKey = 0x30000000;
/// Key of the record that ends a marked stream.
inline constexpr uint32_t kStatsEndMarker = 0xFFFF;

/// How headers are understood.
enum class StatsFraming {
  /// An end marker ends the stream; a header that announces no values is sound whatever its key.
  kMarked,
  /// Every header must be sound, and the stream ends with its last word.
  kUnmarked,
};

/// One record of the statistics stream.
struct StatsRecord {
  /// Of the header, in bytes from the stream's first.
  size_t offset;
  uint32_t key;
  /// Values that the header announces.
  uint32_t count;
  /// The values, 8 bytes each; null when the record was not handed out.
  const unsigned char* values;

  /// A record without values is passed over, whatever its key.
  [[nodiscard]] bool isEmpty() const { return count == 0; }
  /// The first of the values, `limit` at most.
  [[nodiscard]] Elements elements(uint32_t limit) const {
    return {values, kStatsWordSize, std::min(count, limit)};
  }
};

/// Why a walk ended.
enum class StatsEnd {
  kNotReached,
  /// Right behind the last record.
  kComplete,
  /// Behind the last record, with fewer bytes left than a word has; they are ignored.
  kTail,
  kEndMarker,
  /// The header's key is above the greatest.
  kInvalidKey,
  /// The header announces more values than the stream has left.
  kOverrun,
};

/// Cursor over the records of a statistics stream; hands out only what lies within it.
class StatsWalk : public RecordCursor<StatsEnd> {
 public:
  StatsWalk(const void* stream, uint32_t length, StatsFraming framing)
      : RecordCursor(stream, length), framing_(framing) {}

  /// Moves to the next record. When there is none, returns false: `end()` then tells why, and `record` holds
  /// the offset at which the walk ended and the key and count of the header that ended it, if one did.
  bool next(StatsRecord& record) {
    record = {.offset = offset(), .key = 0, .count = 0, .values = nullptr};
    if (atEnd()) return stop(record.offset, left() == 0 ? StatsEnd::kComplete : StatsEnd::kTail);
    const unsigned char* const header = take(kStatsWordSize);
    record.key = static_cast<uint32_t>(loadLittleEndian(header, 4));
    record.count = static_cast<uint32_t>(loadLittleEndian(header + 4, 4));
    if (framing_ == StatsFraming::kUnmarked || !record.isEmpty()) {
      if (framing_ == StatsFraming::kMarked && record.key == kStatsEndMarker) {
        return stop(record.offset, StatsEnd::kEndMarker);
      }
      if (record.key > kGreatestStatsKey) return stop(record.offset, StatsEnd::kInvalidKey);
      if (record.count > left() / kStatsWordSize) return stop(record.offset, StatsEnd::kOverrun);
    }
    record.values = take(size_t{record.count} * kStatsWordSize);
    return true;
  }

  /// Whether no whole word is left.
  [[nodiscard]] bool atEnd() const { return left() < kStatsWordSize; }

  /// Whether a bad header ended the walk.
  [[nodiscard]] bool failed() const { return end() == StatsEnd::kInvalidKey || end() == StatsEnd::kOverrun; }

 private:
  StatsFraming framing_;
};

}  // namespace ksp
