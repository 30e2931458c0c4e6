// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <concepts>
#include <cstddef>
#include <cstring>
#include <iterator>
#include <string>
#include <string_view>

#include "ksp/detail/decimal.hpp"
#include "tools/kspdump/view/view.h"

namespace kspdump {

/// Appends small pieces to a view's text by way of a buffer. The text always has room for what is in it, so
/// that the last of it fails for no want of memory.
class Appender {
 public:
  explicit Appender(Sink& sink) : sink_(sink) { makeRoom(); }
  Appender(const Appender&) = delete;
  Appender& operator=(const Appender&) = delete;
  ~Appender() { sink_.text.append(buffer_, at_); }

  void text(std::string_view piece) {
    if (piece.size() > static_cast<size_t>(std::end(buffer_) - at_)) {
      flush();
      if (piece.size() > sizeof buffer_) {
        sink_.text += piece;
        return;
      }
    }
    at_ = std::copy(piece.begin(), piece.end(), at_);
  }

  void number(uint64_t number) {
    makeSure(ksp::kDecimalRoom);
    at_ = ksp::writeDecimal(at_, number);
  }

  /// Appends a text of at most `kShort` characters; so many can be read behind `piece`, whatever its size.
  static constexpr size_t kShort = 96;
  void shortText(const char* piece, size_t size) {
    makeSure(kShort);
    std::memcpy(at_, piece, kShort);
    at_ += size;
  }

  /// Appends numbers with commas between them.
  void list(const Values& values) {
    constexpr uint32_t kAtOnce = 32;
    const uint32_t count = values.size();
    for (uint32_t done = 0; done < count;) {
      const uint32_t end = done + std::min(count - done, kAtOnce);
      makeSure(kAtOnce * (ksp::kDecimalRoom + 1));
      char* at = at_;
      values.forEach(done, end, [&](uint64_t value) {
        at = ksp::writeDecimal(at, value);
        *at++ = ',';
      });
      at_ = at;
      done = end;
    }
    if (count != 0) --at_;
  }

 private:
  void makeSure(size_t room) {
    if (static_cast<size_t>(std::end(buffer_) - at_) < room) flush();
  }

  void flush() {
    sink_.text.append(buffer_, at_);
    at_ = buffer_;
    sink_.offer();
    makeRoom();
  }

  void makeRoom() { sink_.text.reserve(sink_.text.size() + sizeof buffer_); }

  Sink& sink_;
  char buffer_[8192];
  char* at_ = buffer_;
};

/// Appends a number in decimal.
template <std::integral Number>
void appendNumber(std::string& out, Number number) {
  out += std::to_string(number);
}

/// A number with `decimals` digits behind its point.
std::string fixed(double number, int decimals);

/// A text as UTF-8; each byte that is not is spelled out as in \xff.
std::string utf8(std::string_view text);

/// Whether a text is a JSON string as it stands.
bool isPlainJson(std::string_view text);

/// Appends a text as a JSON string, and as UTF-8.
void appendJson(std::string& out, std::string_view text);

/// Appends a text as a CSV field, and as UTF-8.
void appendCsv(std::string& out, std::string_view text);

/// A text without anything that could steer its reader's eye or terminal, as UTF-8.
std::string legible(std::string_view text);

/// The same in the characters of the locale.
std::string printable(std::string_view text);

/// Appends a line a finding, of a series with the names of its captures.
void appendFindings(std::string& out, const Capture& capture, const std::string& source = "");
void appendFindings(std::string& out, const Series& series);

/// Returns whether the locale's characters are UTF-8.
bool localeIsUtf8();

}  // namespace kspdump
