// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_DETAIL_ELEMENTS_HPP
#define KSP_DETAIL_ELEMENTS_HPP

#include <compare>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <ranges>

#include "ksp/detail/little_endian.hpp"

namespace ksp {

/// Packed little-endian unsigned integers as a random-access range of numbers. The bytes outlive it.
class Elements : public std::ranges::view_base {
 public:
  class Iterator {
   public:
    using iterator_concept = std::random_access_iterator_tag;
    using iterator_category = std::input_iterator_tag;
    using value_type = uint64_t;
    using difference_type = std::ptrdiff_t;
    using reference = uint64_t;

    Iterator() = default;
    Iterator(const unsigned char* at, uint32_t width)
        : at_(at), width_(static_cast<difference_type>(width)) {}

    uint64_t operator*() const { return loadLittleEndian(at_, static_cast<size_t>(width_)); }
    uint64_t operator[](difference_type steps) const { return *(*this + steps); }
    Iterator& operator+=(difference_type steps) {
      at_ += steps * width_;
      return *this;
    }
    Iterator& operator-=(difference_type steps) { return *this += -steps; }
    Iterator& operator++() { return *this += 1; }
    Iterator& operator--() { return *this += -1; }
    Iterator operator++(int) {  // NOLINT(cert-dcl21-cpp): iterators return a plain one
      const Iterator before = *this;
      ++*this;
      return before;
    }
    Iterator operator--(int) {  // NOLINT(cert-dcl21-cpp): iterators return a plain one
      const Iterator before = *this;
      --*this;
      return before;
    }
    friend Iterator operator+(Iterator from, difference_type steps) { return from += steps; }
    friend Iterator operator+(difference_type steps, Iterator from) { return from += steps; }
    friend Iterator operator-(Iterator from, difference_type steps) { return from -= steps; }
    friend difference_type operator-(const Iterator& to, const Iterator& from) {
      return (to.at_ - from.at_) / to.width_;
    }
    bool operator==(const Iterator& other) const { return at_ == other.at_; }
    auto operator<=>(const Iterator& other) const { return at_ <=> other.at_; }

   private:
    const unsigned char* at_ = nullptr;
    std::ptrdiff_t width_ = 1;
  };

  Elements() = default;
  /// `source` holds `count` elements of `width` bytes, 1 to 8, each at any address; it may be null for none.
  Elements(const unsigned char* source, uint32_t width, uint32_t count)
      : source_(source), width_(width), count_(count) {}

  [[nodiscard]] Iterator begin() const { return {source_, width_}; }
  [[nodiscard]] Iterator end() const { return begin() + static_cast<std::ptrdiff_t>(count_); }
  /// `index` is below `size()`.
  [[nodiscard]] uint64_t operator[](uint32_t index) const {
    return loadLittleEndian(source_ + size_t{index} * width_, width_);
  }
  [[nodiscard]] uint32_t size() const { return count_; }
  [[nodiscard]] bool empty() const { return count_ == 0; }
  /// Bytes of an element.
  [[nodiscard]] uint32_t width() const { return width_; }

 private:
  const unsigned char* source_ = nullptr;
  uint32_t width_ = 1;
  uint32_t count_ = 0;
};

}  // namespace ksp

/// Iterators outlive the range that they came from.
template <>
inline constexpr bool std::ranges::enable_borrowed_range<ksp::Elements> = true;

#endif
