// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "context/name_pieces.h"
#include "ksp/context.h"
#include "ksp/detail/decimal.hpp"

namespace ksp {

/// Most characters of a node's text.
inline constexpr size_t kMaxTextLength = KSPNodeTextSize - 2;

/// Returns a node whose text is all zeros, or null.
///
/// This costs less than memory that comes zeroed: of half a text the compiler makes a few stores in place,
/// while calloc, and the whole of it at once, would end in a call or a loop.
[[gnu::always_inline]] inline NameValueNode* allocateNode(uint64_t value) {
  auto* const node = static_cast<NameValueNode*>(std::malloc(sizeof(NameValueNode)));
  if (node == nullptr) return nullptr;
  constexpr size_t kHalf = 48;
  std::memset(node, 0, kHalf);
  std::memset(node->text + kHalf, 0, offsetof(NameValueNode, value) - kHalf);
  node->value = value;
  node->next = nullptr;
  return node;
}

/// The ends of a context's lists while entries are appended; the context has them again after `close`.
class ListEnds {
 public:
  explicit ListEnds(GenericParserContext& context)
      : names_(context.nameTail), values_(context.valueTail), context_(context) {
    const bool linked = names_ != nullptr && values_ != nullptr;
    nameLink_ = linked ? &names_->next : &context.nameHead;
    valueLink_ = linked ? &values_->next : &context.valueHead;
  }

  /// Appends an entry, whose name is made of `pieces`, unless memory runs out; returns whether it did.
  template <class... Pieces>
  [[gnu::always_inline]] bool append(uint64_t value, const Pieces&... pieces) {
    NameValueNode* const valueNode = allocateNode(value);
    NameValueNode* const nameNode = allocateNode(0);
    if (valueNode == nullptr || nameNode == nullptr) [[unlikely]] {
      std::free(valueNode);
      std::free(nameNode);
      return false;
    }
    char* at = nameNode->text;
    ((at = writePiece(at, nameNode->text + kMaxTextLength, pieces)), ...);
    writeDecimal(valueNode->text, value);
    *nameLink_ = names_ = nameNode;
    *valueLink_ = values_ = valueNode;
    nameLink_ = &nameNode->next;
    valueLink_ = &valueNode->next;
    return true;
  }

  void close() {
    context_.nameTail = names_;
    context_.valueTail = values_;
  }

 private:
  NameValueNode* names_;
  NameValueNode* values_;
  NameValueNode** nameLink_;
  NameValueNode** valueLink_;
  GenericParserContext& context_;
};

}  // namespace ksp
