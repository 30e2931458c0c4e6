// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_RECORDS_HPP
#define KSP_RECORDS_HPP

/*
 * The records of a stream as a C++ range, for clients that need no context: what each record is called and
 * hands out, and at the end why the stream ended.
 *
 *   ksp::StatisticsRecords records(stream, length);
 *   for (const ksp::Record& record : records) {
 *     const ksp::RecordName name = record.name();
 *     for (uint64_t value : record.elements) std::cout << name.view() << ' ' << value << '\n';
 *   }
 *   if (records.ending().isBadHeader()) std::cout << "bad header at " << records.ending().offset << '\n';
 *
 * Nothing is allocated or copied, and no byte outside the stream is read whatever its bytes say. The stream
 * must outlive the range and what it hands out; a record holds good until the range moves on, but may be
 * copied. Nothing here is of the shared library: programs need not link it for this.
 */

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <string_view>

#include "ksp/detail/elements.hpp"
#include "ksp/detail/key_entry.hpp"
#include "ksp/detail/key_name.hpp"
#include "ksp/detail/little_endian.hpp"
#include "ksp/detail/msp_keys.hpp"
#include "ksp/detail/stats_keys.hpp"

namespace ksp {

/// What a record is called: as its key table says, else by its key number. Nothing is allocated for it.
class RecordName {
 public:
  explicit RecordName(const KeyName& listed) : listed_(&listed) {}
  RecordName(std::string_view stem, uint32_t key) { made_.assign(stem, key); }

  /// The name, NUL-terminated. It lives as long as this object.
  [[nodiscard]] std::string_view view() const& { return text(); }
  operator std::string_view() const& { return text(); }
  std::string_view view() const&& = delete;
  operator std::string_view() const&& = delete;

  /// As `view`, for a copy of constant size.
  [[nodiscard]] const KeyName& text() const& { return listed_ != nullptr ? *listed_ : made_; }

 private:
  const KeyName* listed_ = nullptr;
  KeyName made_;
};

/// One record of a stream, and what it means.
struct Record {
  /// Of the header, in bytes from the stream's first.
  size_t offset = 0;
  uint32_t key = 0;
  /// What the header announces: values of a statistics record, bytes of a media record.
  uint32_t announced = 0;
  /// What the key table configures, in the same unit; 0 for a key without a row.
  uint32_t configured = 0;
  /// The key's row of the key table, null when there is none.
  const KeyEntry* row = nullptr;
  /// What its name begins with when that is made from the key number; null for a record that is called and
  /// read as its row says.
  const char* stem = "";
  /// False for what is to be passed over: a record that announces nothing, and filler.
  bool counts = false;
  /// Whether the elements are those of an array, even where just one of them is there.
  bool isArray = false;
  /// The values to hand out: whole ones, and no more than are configured. None when the record does not
  /// count.
  Elements elements;

  [[nodiscard]] RecordName name() const { return isListed() ? RecordName(row->name) : RecordName(stem, key); }
  /// Whether the key table says what the record is called and how many values it hands out.
  [[nodiscard]] bool isListed() const { return row != nullptr && stem == nullptr; }
  /// Whether it has the size that the key table configures, as every record does that has no row there.
  [[nodiscard]] bool isAsConfigured() const { return row == nullptr || announced == configured; }
};

/// Why a walk over a stream ended.
enum class EndReason {
  kNotReached,
  /// Right behind the last record.
  kComplete,
  /// Behind the last record, with fewer bytes left than a header has; they are ignored.
  kTail,
  /// At the record that ends the stream.
  kEndMarker,
  /// The header's key is above the greatest.
  kInvalidKey,
  /// The header announces more than the stream has left.
  kOverrun,
};

/// Why and where a walk over a stream ended.
struct Ending {
  EndReason reason = EndReason::kNotReached;
  /// Of the header that ended the walk, if one did, else behind the last record; in bytes from the first.
  size_t offset = 0;
  /// Of the header that ended the walk; 0 when none did.
  uint32_t key = 0;
  uint32_t announced = 0;

  /// Whether a bad header ended the walk.
  [[nodiscard]] bool isBadHeader() const {
    return reason == EndReason::kInvalidKey || reason == EndReason::kOverrun;
  }
};

/// A single-pass range over the records of a stream.
///
/// `Stream` derives from it and has `bool read(Record&)`, which makes the next record, or calls `stop` and
/// returns what that does. Each `begin` starts again at the stream's first byte.
template <class Stream>
class RecordRange {
 public:
  class Iterator {
   public:
    using iterator_concept = std::input_iterator_tag;
    using value_type = Record;
    using difference_type = std::ptrdiff_t;

    Iterator() = default;
    explicit Iterator(RecordRange& range) : range_(&range) {}

    const Record& operator*() const { return range_->record_; }
    const Record* operator->() const { return &range_->record_; }
    Iterator& operator++() {
      range_->advance();
      return *this;
    }
    void operator++(int) { ++*this; }
    bool operator==(std::default_sentinel_t) const { return !range_->hasRecord_; }

   private:
    RecordRange* range_ = nullptr;
  };

  [[nodiscard]] Iterator begin() {
    offset_ = 0;
    ending_ = {};
    advance();
    return Iterator(*this);
  }
  [[nodiscard]] std::default_sentinel_t end() const { return {}; }

  /// Why and where the walk ended, once it has.
  [[nodiscard]] const Ending& ending() const { return ending_; }

 protected:
  /// `stream` holds `length` bytes of any alignment and content; null is an empty stream.
  RecordRange(const void* stream, size_t length)
      : begin_(static_cast<const unsigned char*>(stream)), size_(stream != nullptr ? length : 0) {}

  /// In bytes from the stream's first.
  [[nodiscard]] size_t offset() const { return offset_; }
  [[nodiscard]] size_t left() const { return size_ - offset_; }

  /// Returns the next `count` bytes, of which as many must be left, and moves behind them.
  const unsigned char* take(size_t count) {
    const unsigned char* const bytes = begin_ + offset_;
    offset_ += count;
    return bytes;
  }

  /// Ends the walk at the header that `at` has the offset, key and announcement of. Returns false.
  bool stop(EndReason reason, const Record& at) {
    ending_ = {reason, at.offset, at.key, at.announced};
    return false;
  }
  /// Ends the walk where no header is left. Returns false.
  bool stop() {
    ending_ = {left() == 0 ? EndReason::kComplete : EndReason::kTail, offset()};
    return false;
  }

 private:
  void advance() { hasRecord_ = static_cast<Stream*>(this)->read(record_); }

  const unsigned char* begin_;
  size_t size_;
  size_t offset_ = 0;
  bool hasRecord_ = false;
  Record record_;
  Ending ending_;
};

/// How the headers of a statistics stream are understood.
enum class StatisticsFraming {
  /// An end marker ends the stream; a header that announces no values is sound whatever its key.
  kMarked,
  /// Every header must be sound, and the stream ends with its last word.
  kUnmarked,
};

/// What the records of a statistics stream are called.
enum class StatisticsNaming {
  /// As the key table says, `Stat_<key>` for other keys; no more values are handed out than it configures.
  kByTable,
  /// All `Stat_<key>`, with every value that the header announces.
  kByNumber,
};

/// The records of a statistics stream, the controller's lifetime statistics.
class StatisticsRecords : public RecordRange<StatisticsRecords> {
 public:
  /// A record is a header word and its values, a word each, of this many bytes.
  static constexpr uint32_t kWordSize = 8;
  /// Greatest key that a header can have.
  static constexpr uint32_t kGreatestKey = 0x30000000;
  /// Key of the record that ends a marked stream.
  static constexpr uint32_t kEndMarker = 0xFFFF;

  /// `stream` holds `length` bytes of any alignment and content; null is an empty stream.
  StatisticsRecords(const void* stream, size_t length, StatisticsFraming framing = StatisticsFraming::kMarked,
                    StatisticsNaming naming = StatisticsNaming::kByTable)
      : RecordRange(stream, length), framing_(framing), naming_(naming) {}

 private:
  friend RecordRange;

  bool read(Record& record) {
    if (left() < kWordSize) return stop();
    record.offset = offset();
    const unsigned char* const header = take(kWordSize);
    record.key = loadLittleEndian<uint32_t>(header);
    record.announced = loadLittleEndian<uint32_t>(header + 4);
    record.counts = record.announced != 0;
    if (framing_ == StatisticsFraming::kUnmarked || record.counts) {
      if (framing_ == StatisticsFraming::kMarked && record.key == kEndMarker) {
        return stop(EndReason::kEndMarker, record);
      }
      if (record.key > kGreatestKey) return stop(EndReason::kInvalidKey, record);
      if (record.announced > left() / kWordSize) return stop(EndReason::kOverrun, record);
    }
    interpret(record, take(size_t{record.announced} * kWordSize));
    return true;
  }

  void interpret(Record& record, const unsigned char* values) const {
    record.row = findStatsKey(record.key);
    record.configured = record.row != nullptr ? record.row->count : 0;
    const bool isListed = record.row != nullptr && naming_ == StatisticsNaming::kByTable;
    const uint32_t limit = isListed ? record.configured : record.announced;
    record.elements = {values, kWordSize, std::min(record.announced, limit)};
    record.isArray = limit > 1;
    record.stem = isListed ? nullptr : "Stat_";
  }

  StatisticsFraming framing_;
  StatisticsNaming naming_;
};

/// The records of a media statistics stream.
///
/// A key that stands in no table is called `Media_<key>`; its elements have the width that all keys of its
/// range have.
class MediaRecords : public RecordRange<MediaRecords> {
 public:
  /// Bytes of a record's header: the key and the length of the value behind it, 16 bits each.
  static constexpr size_t kHeaderSize = 4;
  /// Key of filler records.
  static constexpr uint16_t kFiller = 0x2FFE;
  /// Key of the record that ends the stream, unless it is empty.
  static constexpr uint16_t kEndMarker = 0x2FFF;

  /// `stream` holds `length` bytes of any alignment and content; null is an empty stream.
  MediaRecords(const void* stream, size_t length) : RecordRange(stream, length) {}

 private:
  friend RecordRange;

  bool read(Record& record) {
    if (left() < kHeaderSize) return stop();
    record.offset = offset();
    const unsigned char* const header = take(kHeaderSize);
    const auto key = loadLittleEndian<uint16_t>(header);
    record.key = key;
    record.announced = loadLittleEndian<uint16_t>(header + 2);
    if (key == kEndMarker && record.announced != 0) return stop(EndReason::kEndMarker, record);
    if (record.announced > left()) return stop(EndReason::kOverrun, record);
    record.counts = record.announced != 0 && key != kFiller;
    interpret(record, key, take(record.announced));
    return true;
  }

  static void interpret(Record& record, uint16_t key, const unsigned char* value) {
    const uint32_t width = mspElementWidth(key);
    const uint32_t whole = record.counts ? record.announced / width : 0;
    record.row = LookupMSPKey(key);
    const uint32_t limit = record.row != nullptr ? record.row->count : whole;
    record.configured = record.row != nullptr ? limit * width : 0;
    record.elements = {value, width, std::min(whole, limit)};
    record.isArray = limit > 1;
    record.stem = record.row != nullptr ? nullptr : "Media_";
  }
};

}  // namespace ksp

#endif
