// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "numbers/format.h"
#include "snapshot/word.h"

namespace ksp {

/// An array of triples, one per priority: operations, total latency and maximum latency, a word each.
constexpr uint32_t kTripleBytes = 12;

struct TripleColumn {
  const char* letter;
  uint32_t offset;
  NumberFormat first;
  NumberFormat further;
};

inline constexpr TripleColumn kTripleColumns[] = {
    {"O", 0, "%4u", "/%4u"},
    {"L", 4, "%7u", "/%7u"},
    {"M", 8, "%5u", "/%5u"},
};

/// Writes the array column by column: `label(letter)`, then the words of all priorities, joined by slashes.
template <class Sink, class Label>
void writeTriples(Sink& sink, const uint8_t* triples, size_t count, Label label) {
  for (const TripleColumn& column : kTripleColumns) {
    label(column.letter);
    for (size_t k = 0; k < count && sink.fits(); ++k) {
      const uint8_t* word = triples + kTripleBytes * k + column.offset;
      sink.number(k == 0 ? column.first : column.further, loadWord(word));
    }
  }
}

}  // namespace ksp
