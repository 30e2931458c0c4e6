// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/grid.h"

#include <algorithm>

#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

bool isFurther(char byte) {
  return (static_cast<unsigned char>(byte) & 0xC0) == 0x80;
}

/// Where the character of a place begins.
size_t offsetOf(std::string_view text, size_t character) {
  size_t offset = 0;
  for (; offset < text.size(); ++offset) {
    if (!isFurther(text[offset]) && character-- == 0) break;
  }
  return offset;
}

}  // namespace

size_t columnsOf(std::string_view text) {
  if (!localeIsUtf8()) return text.size();
  return text.size() - static_cast<size_t>(std::count_if(text.begin(), text.end(), isFurther));
}

std::string cutTo(std::string_view text, size_t width) {
  const size_t columns = columnsOf(text);
  if (columns <= width) return std::string(text);
  const std::string_view ellipsis = localeIsUtf8() ? "…" : "...";
  const size_t kept = width - std::min(width, columnsOf(ellipsis));
  // What tells names apart stands at both ends.
  const size_t front = (kept + 1) / 2;
  return std::string(text.substr(0, offsetOf(text, front))) + std::string(ellipsis) +
         std::string(text.substr(offsetOf(text, columns - (kept - front))));
}

void appendPadded(std::string& out, std::string_view text, size_t width, bool right) {
  const size_t columns = columnsOf(text);
  const size_t blanks = columns < width ? width - columns : 0;
  if (right) out.append(blanks, ' ');
  out += text;
  if (!right) out.append(blanks, ' ');
}

Grid::Grid(std::vector<Column> columns) : columns_(std::move(columns)) {
  for (const Column& column : columns_) widths_.push_back(columnsOf(column.head));
}

void Grid::add(const std::vector<std::string>& row) {
  for (size_t i = 0; i < row.size(); ++i) {
    widths_[i] = std::max(widths_[i], columnsOf(row[i]));
    texts_ += row[i];
    ends_.push_back(texts_.size());
  }
}

void Grid::fit(size_t name, size_t least, size_t width, size_t reserve) {
  const size_t wanted = this->width() + reserve;
  const size_t tooWide = wanted > width ? wanted - width : 0;
  widths_[name] -= std::min(tooWide, widths_[name] - std::min(widths_[name], least));
}

size_t Grid::width() const {
  size_t width = kGap * (widths_.size() - 1);
  for (const size_t column : widths_) width += column;
  return width;
}

void Grid::appendHead(std::string& out) const {
  for (size_t i = 0; i < columns_.size(); ++i) append(out, i, columns_[i].head);
}

void Grid::appendRow(std::string& out, size_t row) const {
  const size_t first = row * columns_.size();
  size_t begin = first == 0 ? 0 : ends_[first - 1];
  for (size_t i = 0; i < columns_.size(); ++i) {
    const size_t end = ends_[first + i];
    append(out, i, std::string_view(texts_).substr(begin, end - begin));
    begin = end;
  }
}

void Grid::append(std::string& out, size_t column, std::string_view text) const {
  if (column != 0) out.append(kGap, ' ');
  appendPadded(out, cutTo(text, widths_[column]), widths_[column], columns_[column].right);
}

}  // namespace kspdump
