// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace kspdump {

/// Which records are asked for: those that any of its patterns or keys selects, or all where it has none.
class Selection {
 public:
  /// A shell pattern of names.
  void addPattern(const std::string& pattern);
  /// `N` or `N-M`. Returns false, nothing added, for any other text.
  bool addKeys(std::string_view text);
  void ignoreCase() { ignoresCase_ = true; }

  [[nodiscard]] bool isEmpty() const { return selectors_.empty(); }
  [[nodiscard]] size_t size() const { return selectors_.size(); }
  /// As it is written on the command line.
  [[nodiscard]] std::string text(size_t selector) const;

  /// Whether a record is selected. Marks in `used`, of `size()` elements, each selector that selects it.
  bool selects(std::string_view name, uint32_t key, std::vector<bool>& used) const;

 private:
  struct Selector {
    /// Empty for keys.
    std::string pattern;
    uint32_t firstKey = 0;
    uint32_t lastKey = 0;
  };

  [[nodiscard]] bool matches(const Selector& selector, const char* name, uint32_t key) const;

  std::vector<Selector> selectors_;
  bool ignoresCase_ = false;
};

}  // namespace kspdump
