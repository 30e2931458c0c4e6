// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <memory>
#include <new>
#include <span>

namespace kspdump {

/// Bytes that are read into, again and again. What is not yet read takes no memory, and growing copies none.
class Buffer {
 public:
  [[nodiscard]] const unsigned char* data() const { return bytes_.get(); }
  [[nodiscard]] size_t size() const { return size_; }
  operator std::span<const unsigned char>() const { return {data(), size_}; }

  /// Room for `count` bytes behind the last one; `added` tells how many of them were filled. Throws
  /// std::bad_alloc, the bytes as they were.
  unsigned char* room(size_t count) {
    if (count > capacity_ - size_) {
      const size_t capacity = std::max(size_ + count, size_ + size_ / 4);
      void* const grown = std::realloc(bytes_.get(), capacity);
      if (grown == nullptr) throw std::bad_alloc();
      static_cast<void>(bytes_.release());
      bytes_.reset(static_cast<unsigned char*>(grown));
      capacity_ = capacity;
    }
    return bytes_.get() + size_;
  }

  void added(size_t count) { size_ += count; }

  /// Forgets the bytes. What they took serves the next ones, unless it was much.
  void clear() {
    constexpr size_t kMuch = size_t{1} << 20;
    if (capacity_ > kMuch) *this = {};
    size_ = 0;
  }

  Buffer() = default;
  Buffer(Buffer&& other) noexcept { swap(other); }
  Buffer& operator=(Buffer&& other) noexcept {
    Buffer taken(std::move(other));
    swap(taken);
    return *this;
  }

 private:
  void swap(Buffer& other) noexcept {
    bytes_.swap(other.bytes_);
    std::swap(size_, other.size_);
    std::swap(capacity_, other.capacity_);
  }

  struct Free {
    void operator()(unsigned char* bytes) const { std::free(bytes); }
  };
  std::unique_ptr<unsigned char, Free> bytes_;
  size_t size_ = 0;
  size_t capacity_ = 0;
};

}  // namespace kspdump
