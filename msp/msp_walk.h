#pragma once

#include <cstddef>
#include <cstdint>

#include "context/little_endian.h"
#include "context/record_cursor.h"

namespace ksp {

/// Bytes of a record's header: the key and the length of the value behind it, 16 bits each.
inline constexpr size_t kMSPHeaderSize = 4;
/// Key of filler records.
inline constexpr uint16_t kMSPKeySkip = 0x2FFE;
/// Key of the record that ends the stream.
inline constexpr uint16_t kMSPKeyEnd = 0x2FFF;

/// One record of the media statistics stream.
struct MSPRecord {
  /// Of the header, in bytes from the stream's first.
  size_t offset;
  uint16_t key;
  /// Bytes of the value that the header announces.
  uint16_t length;
  /// The value; null when the record was not handed out.
  const unsigned char* value;

  /// A record without a value is passed over, whatever its key.
  [[nodiscard]] bool isEmpty() const { return length == 0; }
  [[nodiscard]] bool isFiller() const { return key == kMSPKeySkip; }
};

/// Why a walk ended.
enum class MSPEnd {
  kNotReached,
  /// Right behind the last record.
  kComplete,
  /// Behind the last record, with fewer bytes left than a header has.
  kTruncatedHeader,
  kEndRecord,
  /// The header announces more bytes than the stream has left.
  kOverrun,
};

/// Cursor over the records of a media statistics stream; hands out only what lies within it.
class MSPWalk : public RecordCursor<MSPEnd> {
 public:
  MSPWalk(const void* stream, uint32_t length) : RecordCursor(stream, length) {}

  /// Moves to the next record. When there is none, returns false: `end()` then tells why, and `record` holds
  /// the offset at which the walk ended and the key and length of the header that ended it, if one did.
  bool next(MSPRecord& record) {
    record = {.offset = offset(), .key = 0, .length = 0, .value = nullptr};
    if (left() < kMSPHeaderSize) {
      return stop(record.offset, left() == 0 ? MSPEnd::kComplete : MSPEnd::kTruncatedHeader);
    }
    const unsigned char* const header = take(kMSPHeaderSize);
    record.key = static_cast<uint16_t>(loadLittleEndian(header, 2));
    record.length = static_cast<uint16_t>(loadLittleEndian(header + 2, 2));
    if (record.key == kMSPKeyEnd && !record.isEmpty()) return stop(record.offset, MSPEnd::kEndRecord);
    if (record.length > left()) return stop(record.offset, MSPEnd::kOverrun);
    record.value = take(record.length);
    return true;
  }
};

}  // namespace ksp
