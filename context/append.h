#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "context/decimal.h"
#include "context/key_name.h"
#include "context/little_endian.h"
#include "ksp/context.h"

namespace ksp {

/// Most characters of a node's text.
inline constexpr size_t kMaxTextLength = KSPNodeTextSize - 2;
/// Widest element of an array, in bytes.
inline constexpr uint32_t kMaxElementWidth = 8;
/// Most elements that one array append takes.
inline constexpr uint32_t kMaxElements = UINT16_MAX;

/// `count` packed little-endian unsigned integers of `width` bytes each.
struct Elements {
  const unsigned char* source;
  uint32_t width;
  uint32_t count;

  [[nodiscard]] uint64_t operator[](uint32_t index) const {
    return loadLittleEndian(source + size_t{index} * width, width);
  }
};

// What names are made of. Each `writePiece` writes a piece at `at`, where all is zero, cuts it at `end`, and
// returns where it ends.

inline char* writePiece(char* at, const char* end, std::string_view piece) {
  const size_t size = std::min(piece.size(), static_cast<size_t>(end - at));
  std::memcpy(at, piece.data(), size);
  return at + size;
}

[[gnu::always_inline]] inline char* writePiece(char* at, const char* end, const KeyName& name) {
  if (static_cast<size_t>(end - at) < KeyName::kRoom) [[unlikely]] {
    return writePiece(at, end, std::string_view(name));
  }
  std::memcpy(at, name.data(), KeyName::kRoom);
  return at + name.size();
}

[[gnu::always_inline]] inline char* writePiece(char* at, const char* end, char piece) {
  if (at != end) *at++ = piece;
  return at;
}

/// The index of an element, counted up in decimal from 0 to 65535.
class Index {
 public:
  void operator++() {
    ++value_;
    const unsigned lastDigit = 8 * (size_ - 1);
    if (text_ >> lastDigit != '9') {
      text_ += uint64_t{1} << lastDigit;
    } else {
      text_ = afresh(value_);  // every tenth step
      size_ = (71 - static_cast<unsigned>(std::countl_zero(text_))) / 8;
    }
  }
  [[nodiscard]] uint32_t value() const { return value_; }

  [[gnu::always_inline]] char* write(char* at, const char* end) const {
    if (static_cast<size_t>(end - at) >= sizeof text_) [[likely]] {
      decimal::store(at, text_);
      return at + size_;
    }
    char text[sizeof text_];
    decimal::store(text, text_);
    return writePiece(at, end, std::string_view(text, size_));
  }

 private:
  // Not inlined, as the compiler would carry its intermediate products through the whole loop.
  [[gnu::noinline]] static uint64_t afresh(uint32_t value) {
    const uint64_t digits = decimal::eightDigits(value);
    return (digits | decimal::kZeros) >> 8 * decimal::leadingZeros(digits);
  }

  uint64_t text_ = '0';  // the first digit in the lowest byte
  unsigned size_ = 1;
  uint32_t value_ = 0;
};

[[gnu::always_inline]] inline char* writePiece(char* at, const char* end, const Index& index) {
  return index.write(at, end);
}

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

/// Appends an entry for each element: under the bare name when there is one, else with its index behind it.
///
/// Returns true when every element was appended, so also when there is none. An element for which there is no
/// memory is left out; elements too wide or too many are refused as a whole.
template <class... Pieces>
bool appendElements(GenericParserContext* context, Elements elements, const Pieces&... pieces) {
  if (elements.width == 0 || elements.count == 0) return true;
  if (elements.width > kMaxElementWidth || elements.count > kMaxElements || context == nullptr) return false;
  if (elements.count == 1) return appendEntry(context, elements[0], pieces...);
  bool all = true;
  ListEnds ends(*context);
  for (Index i; i.value() < elements.count; ++i) all &= ends.append(elements[i.value()], pieces..., i);
  ends.close();
  return all;
}

/// Appends one entry to a legacy context; without memory for it, nothing.
inline void AddSingleValueToKSPContext(KSPParseContext& context, const KeyName& name, uint64_t value) {
  appendEntry(&context.entries, value, name);
}

}  // namespace ksp
