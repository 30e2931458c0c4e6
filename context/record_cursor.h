#pragma once

#include <cstddef>
#include <cstdint>

namespace ksp {

/// What the walks over records share: where they are, and why they ended. `End` is an enumeration of reasons
/// whose first is that the end is not reached.
template <class End>
class RecordCursor {
 public:
  [[nodiscard]] End end() const { return end_; }

 protected:
  /// `stream` holds `length` bytes of any alignment and content; null is an empty stream.
  RecordCursor(const void* stream, uint32_t length)
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

  /// Ends the walk at `offset`, where the header stands that ended it, if one did. Returns false.
  bool stop(size_t offset, End reason) {
    offset_ = offset;
    end_ = reason;
    return false;
  }

 private:
  const unsigned char* begin_;
  size_t size_;
  size_t offset_ = 0;
  End end_{};
};

}  // namespace ksp
