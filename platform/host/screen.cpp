// SPDX-License-Identifier: Apache-2.0
#include "platform/host/screen.h"

#include <algorithm>
#include <cstddef>
#include <string>

namespace host {

namespace {

constexpr unsigned kGreatestNesting = 8;

bool isAscii(std::string_view text) {
  return std::all_of(text.begin(), text.end(), [](unsigned char c) { return c < 0x80; });
}

/// Returns the index behind the quoted text that starts at `start`; one that lacks its end stops at its
/// line's.
size_t endOfQuoted(std::string_view text, size_t start) {
  const char quote = text[start];
  size_t at = start + 1;
  while (at < text.size() && text[at] != quote && text[at] != '\n') {
    at += quote == '"' && text[at] == '\\' ? size_t{2} : size_t{1};
  }
  return std::min(at + 1, text.size());
}

}  // namespace

std::optional<Objection> objectionTo(std::string_view text) {
  constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
  unsigned brackets = 0;
  unsigned dots = 0;
  for (size_t at = text.starts_with(kByteOrderMark) ? kByteOrderMark.size() : 0; at < text.size();) {
    const auto objection = [&](std::string_view fault) {
      const std::string_view before = text.substr(0, at);
      return Objection{1 + static_cast<unsigned>(std::count(before.begin(), before.end(), '\n')), fault};
    };
    size_t next = at + 1;
    switch (text[at]) {
      case '#':
        next = std::min(text.find('\n', at), text.size());
        break;
      case '"':
      case '\'':
        if (text.substr(at, 3) == std::string(3, text[at])) return objection("a text in three quotes");
        next = endOfQuoted(text, at);
        break;
      case '.':
        ++dots;
        break;
      case '[':
      case '{':
        ++brackets;
        dots = 0;
        break;
      case ']':
      case '}':
        brackets -= brackets > 0 ? 1 : 0;
        dots = 0;
        break;
      case '=':
      case ',':
      case '\n':
        dots = 0;
        break;
      default:
        break;
    }
    if (text[at] != '#' && !isAscii(text.substr(at, next - at))) {
      return objection("a character beyond ASCII outside of a comment");
    }
    // So many dots join one part more.
    if (brackets > kGreatestNesting || dots >= kGreatestNesting)
      return objection("nested deeper than 8 levels");
    at = next;
  }
  return std::nullopt;
}

}  // namespace host
