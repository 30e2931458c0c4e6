// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "context/list_ends.h"
#include "context/name_pieces.h"
#include "ksp/context.h"
#include "ksp/detail/elements.hpp"

namespace ksp {

/// Widest element of an array, in bytes.
inline constexpr uint32_t kMaxElementWidth = 8;
/// Most elements that one array append takes.
inline constexpr uint32_t kMaxElements = UINT16_MAX;

/// Appends one entry, whose name is made of `pieces`.
///
/// Returns false, with the context as it was, when `context` is null or memory ran out.
template <class... Pieces>
bool appendEntry(GenericParserContext* context, uint64_t value, const Pieces&... pieces) {
  if (context == nullptr) return false;
  ListEnds ends(*context);
  const bool appended = ends.append(value, pieces...);
  ends.close();
  return appended;
}

/// Whether there is no element to append, which every context takes.
inline bool isNothing(const Elements& elements) {
  return elements.width() == 0 || elements.empty();
}

/// Whether a context takes these elements; too wide or too many are refused as a whole.
inline bool takes(const GenericParserContext* context, const Elements& elements) {
  return context != nullptr && elements.width() <= kMaxElementWidth && elements.size() <= kMaxElements;
}

/// Appends an entry for each element: under the bare name when there is one, else with its index behind it.
///
/// Returns true when every element was appended, so also when there is none. An element for which there is no
/// memory is left out. Inlined, as most callers know the elements' width.
template <class... Pieces>
[[gnu::always_inline]] inline bool appendElements(GenericParserContext* context, Elements elements,
                                                  const Pieces&... pieces) {
  if (isNothing(elements)) return true;
  if (!takes(context, elements)) return false;
  if (elements.size() == 1) return appendEntry(context, elements[0], pieces...);
  bool all = true;
  ListEnds ends(*context);
  for (Index i; i.value() < elements.size(); ++i) all &= ends.append(elements[i.value()], pieces..., i);
  ends.close();
  return all;
}

}  // namespace ksp
