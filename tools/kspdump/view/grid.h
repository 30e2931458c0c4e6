// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kspdump/view/view.h"

namespace kspdump {

/// Columns that a text takes on a terminal.
size_t columnsOf(std::string_view text);

/// A text of at most `width` columns: cut in the middle, an ellipsis in place of what is missing.
std::string cutTo(std::string_view text, size_t width);

/// Appends a text, blanks behind or, for `right`, in front of it, `width` columns in all.
void appendPadded(std::string& out, std::string_view text, size_t width, bool right);

/// Rows of texts in columns, two blanks apart.
///
/// A last column of pictures, made once it is known how wide they may be, is up to the caller.
class Grid {
 public:
  struct Column {
    std::string head;
    bool right;
  };
  static constexpr size_t kGap = 2;

  explicit Grid(std::vector<Column> columns);

  /// A text for each column.
  void add(const std::vector<std::string>& row);

  /// Makes column `name` narrower, `least` columns at least, where that fits lines of `width` columns with
  /// `reserve` behind them.
  void fit(size_t name, size_t least, size_t width, size_t reserve);

  [[nodiscard]] size_t rows() const { return ends_.size() / columns_.size(); }
  /// Columns that a line takes.
  [[nodiscard]] size_t width() const;

  void appendHead(std::string& out) const;
  void appendRow(std::string& out, size_t row) const;

 private:
  /// Appends a column's text to a line.
  void append(std::string& out, size_t column, std::string_view text) const;

  std::vector<Column> columns_;
  std::vector<size_t> widths_;
  /// The rows' texts, one behind the other, and where each ends.
  std::string texts_;
  std::vector<size_t> ends_;
};

}  // namespace kspdump
