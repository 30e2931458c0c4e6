// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <string_view>

#include "numbers/format.h"

namespace ksp {

/// Writes a text piece by piece into a caller's buffer and owns the position and the remaining space.
///
/// A piece fits when its length is smaller than the remaining space, so that a NUL has room behind it. The
/// first piece that does not fit is cut and NUL-terminated at the end of the buffer; from then on nothing is
/// written. A buffer of 0 bytes is never written to.
class PieceWriter {
 public:
  PieceWriter(char* out, uint64_t capacity) : begin_(out), position_(out), remaining_(capacity) {}

  /// Whether every piece so far has fitted.
  bool fits() const { return remaining_ > 0; }

  /// The length of the text, without its NUL, as long as every piece has fitted.
  uint64_t length() const { return static_cast<uint64_t>(position_ - begin_); }

  void text(std::string_view piece);
  void number(const NumberFormat& format, uint32_t value);

  /// A piece formatted by the C library. `format` need not be a literal: the caller has checked it.
  template <class... Values>
  void print(const char* format, Values... values) {
    if (!fits()) return;
    // Some C libraries refuse a larger space; no piece comes near it.
    const auto space = static_cast<size_t>(std::min<uint64_t>(remaining_, INT_MAX));
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
#pragma GCC diagnostic ignored "-Wformat-security"
    advance(std::snprintf(position_, space, format, values...));
#pragma GCC diagnostic pop
  }

 private:
  void advance(int length);

  char* begin_;
  char* position_;
  uint64_t remaining_;  // 0 from the first piece on that did not fit
};

}  // namespace ksp
