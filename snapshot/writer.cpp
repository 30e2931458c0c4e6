// SPDX-License-Identifier: Apache-2.0
#include "snapshot/writer.h"

#include <cstring>

namespace ksp {

void PieceWriter::text(std::string_view piece) {
  if (!fits()) return;
  const bool whole = piece.size() < remaining_;
  const size_t length = whole ? piece.size() : static_cast<size_t>(remaining_ - 1);
  std::memcpy(position_, piece.data(), length);
  position_ += length;
  *position_ = '\0';
  remaining_ = whole ? remaining_ - length : 0;
}

void PieceWriter::number(const NumberFormat& format, uint32_t value) {
  char piece[kNumberRoom];
  text({piece, putNumber(piece, format, value)});
}

// A negative length is the C library's error: such a piece does not fit either.
void PieceWriter::advance(int length) {
  const auto written = static_cast<uint64_t>(length);
  const bool whole = length >= 0 && written < remaining_;
  if (whole) position_ += length;
  remaining_ = whole ? remaining_ - written : 0;
}

}  // namespace ksp
