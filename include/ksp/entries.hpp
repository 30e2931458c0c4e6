// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_ENTRIES_HPP
#define KSP_ENTRIES_HPP

/*
 * A context's entries as a C++ range, and contexts that release themselves.
 *
 *   ksp::GenericContext context;
 *   KSPFTLParseBufferToCxt(context.get(), stream, length);
 *   for (auto [name, value] : ksp::entries(context)) std::cout << name << ' ' << value << '\n';
 */

#include <cstddef>
#include <cstdint>
#include <iterator>
#include <ranges>
#include <string_view>
#include <utility>

#include "ksp/context.h"

namespace ksp {

/// One entry of a context; `name` points into the context and lives until it is released.
struct Entry {
  std::string_view name;
  uint64_t value;
};

/// Forward range over a context's entries, in the order in which they were appended.
///
/// A view of a context that has entries shows those appended later too; one of an empty context stays empty.
/// Releasing the context ends the view's life.
class EntryView : public std::ranges::view_base {
 public:
  class Iterator {
   public:
    using iterator_concept = std::forward_iterator_tag;
    using iterator_category = std::input_iterator_tag;
    using value_type = Entry;
    using difference_type = std::ptrdiff_t;
    using reference = Entry;

    Iterator() = default;
    Iterator(const NameValueNode* name, const NameValueNode* value) : name_(name), value_(value) {}

    Entry operator*() const { return {name_->text, value_->value}; }
    Iterator& operator++() {
      name_ = name_->next;
      value_ = value_->next;
      return *this;
    }
    Iterator operator++(int) {  // NOLINT(cert-dcl21-cpp): iterators return a plain one
      Iterator before = *this;
      ++*this;
      return before;
    }
    bool operator==(const Iterator&) const = default;
    bool operator==(std::default_sentinel_t) const { return name_ == nullptr; }

   private:
    const NameValueNode* name_ = nullptr;
    const NameValueNode* value_ = nullptr;
  };

  EntryView() = default;
  explicit EntryView(const GenericParserContext& context) : first_(context.nameHead, context.valueHead) {}

  [[nodiscard]] Iterator begin() const { return first_; }
  [[nodiscard]] std::default_sentinel_t end() const { return {}; }
  [[nodiscard]] bool empty() const { return first_ == end(); }

 private:
  Iterator first_;
};

}  // namespace ksp

/// Iterators outlive the view that they came from.
template <>
inline constexpr bool std::ranges::enable_borrowed_range<ksp::EntryView> = true;

namespace ksp {

/// A context that starts empty, releases its entries at the end of its life, and can be moved but not copied.
template <class Context, void (*release)(Context*)>
class OwnedContext {
 public:
  OwnedContext() = default;
  OwnedContext(OwnedContext&& other) noexcept : context_(std::exchange(other.context_, {})) {}
  OwnedContext& operator=(OwnedContext&& other) noexcept {
    std::swap(context_, other.context_);
    return *this;
  }
  OwnedContext(const OwnedContext&) = delete;
  OwnedContext& operator=(const OwnedContext&) = delete;
  ~OwnedContext() { release(&context_); }

  /// For the parsers and the other functions of the C interface.
  [[nodiscard]] Context* get() { return &context_; }
  [[nodiscard]] const Context& operator*() const { return context_; }
  [[nodiscard]] const Context* operator->() const { return &context_; }

  /// Releases the entries; the context can then be filled again.
  void reset() { release(&context_); }

 private:
  Context context_{};
};

/// What `KSPFTLParseBufferToCxt`, `KSPFTLParseStatKeyBufferToCxt` and `KSPMSPParseBufferToCxt` fill.
using GenericContext = OwnedContext<GenericParserContext, ReleaseGenericParserCxt>;
/// What `KSPParseBufferToCxt` fills.
using LegacyContext = OwnedContext<KSPParseContext, KSPReleaseContext>;

/// Returns the entries of a context of either kind, whoever owns it.
[[nodiscard]] inline EntryView entries(const GenericParserContext& context) {
  return EntryView(context);
}
[[nodiscard]] inline EntryView entries(const KSPParseContext& context) {
  return EntryView(context.entries);
}
template <class Context, void (*release)(Context*)>
[[nodiscard]] EntryView entries(const OwnedContext<Context, release>& context) {
  return entries(*context);
}
/// The entries of a temporary context would be gone before they are read.
template <class Context, void (*release)(Context*)>
void entries(const OwnedContext<Context, release>&& context) = delete;

}  // namespace ksp

#endif
