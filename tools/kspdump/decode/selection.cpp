// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/decode/selection.h"

#include <fnmatch.h>

#include <charconv>

namespace kspdump {

void Selection::addPattern(const std::string& pattern) {
  selectors_.push_back({.pattern = pattern});
}

bool Selection::addKeys(std::string_view text) {
  Selector selector;
  const char* const end = text.data() + text.size();
  auto read = std::from_chars(text.data(), end, selector.firstKey);
  if (read.ec != std::errc()) return false;
  selector.lastKey = selector.firstKey;
  if (read.ptr != end && *read.ptr == '-') read = std::from_chars(read.ptr + 1, end, selector.lastKey);
  if (read.ec != std::errc() || read.ptr != end || selector.lastKey < selector.firstKey) return false;
  selectors_.push_back(selector);
  return true;
}

std::string Selection::text(size_t selector) const {
  const Selector& which = selectors_[selector];
  if (!which.pattern.empty()) return "--match " + which.pattern;
  std::string keys = "--key " + std::to_string(which.firstKey);
  if (which.lastKey != which.firstKey) keys += "-" + std::to_string(which.lastKey);
  return keys;
}

bool Selection::selects(std::string_view name, uint32_t key, std::vector<bool>& used) const {
  bool isSelected = isEmpty();
  const std::string terminated = isSelected ? "" : std::string(name);
  for (size_t i = 0; i < selectors_.size(); ++i) {
    if (!matches(selectors_[i], terminated.c_str(), key)) continue;
    isSelected = true;
    used[i] = true;
  }
  return isSelected;
}

bool Selection::matches(const Selector& selector, const char* name, uint32_t key) const {
  if (selector.pattern.empty()) return key >= selector.firstKey && key <= selector.lastKey;
  return fnmatch(selector.pattern.c_str(), name, ignoresCase_ ? FNM_CASEFOLD : 0) == 0;
}

}  // namespace kspdump
