// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

#include "ksp/entries.hpp"

/// Streams and entries as text; `parse_cases.txt` describes both.
namespace ksp::test {

class Stream {
 public:
  static Stream statistics(const std::string& text) { return {text, false}; }
  static Stream media(const std::string& text) { return {text, true}; }

  Stream(const std::string& text, bool isMedia) {
    const unsigned headerHalf = isMedia ? 2 : 4;
    std::istringstream tokens(text);
    for (std::string token; tokens >> token;) {
      size_t used = 0;
      const uint64_t number = std::stoull(token, &used, 0);
      const char mark = token[used];
      const std::vector<uint64_t> values = valuesOf(token.substr(used + 1));
      const uint64_t width = mark == '*' ? number : isMedia && number < 12288 ? 4 : 8;
      if (mark != '*') {
        put({number}, headerHalf);
        put({mark == '#' ? values[0] : values.size() * (isMedia ? width : 1)}, headerHalf);
      }
      if (mark != '#') put(values, width);
    }
  }

  /// Hands the stream to `parse` from an odd address, with nothing behind its last byte.
  template <class Parse, class... Context>
  auto into(Parse parse, Context*... context) const {
    return parse(context..., bytes_.data() + 1, static_cast<uint32_t>(bytes_.size() - 1));
  }

 private:
  static std::vector<uint64_t> valuesOf(const std::string& text) {
    std::vector<uint64_t> values;
    std::istringstream items(text);
    for (std::string item; std::getline(items, item, ',');) {
      const size_t dots = item.find("..");
      const uint64_t last = std::stoull(item.substr(dots == item.npos ? 0 : dots + 2), nullptr, 0);
      uint64_t value = std::stoull(item, nullptr, 0) - 1;
      do values.push_back(++value);
      while (value != last);
    }
    return values;
  }

  void put(const std::vector<uint64_t>& values, uint64_t width) {
    for (uint64_t value : values) {
      for (uint64_t i = 0; i < width; ++i, value >>= 8) bytes_.push_back(static_cast<unsigned char>(value));
    }
  }

  std::vector<unsigned char> bytes_ = std::vector<unsigned char>(1);
};

/// The entries of a context as "name=value name=value".
template <class Context>
std::string textOf(const Context& context) {
  std::ostringstream text;
  for (auto [name, value] : entries(context)) text << (text.tellp() > 0 ? " " : "") << name << '=' << value;
  return text.str();
}

/// Writes each "name*3" out as "name0=1 name1=2 name2=3".
inline std::string expanded(const std::string& text) {
  std::ostringstream out;
  std::istringstream tokens(text);
  for (std::string token; tokens >> token;) {
    const size_t star = token.find('*');
    const unsigned long count = star == token.npos ? 1 : std::stoul(token.substr(star + 1));
    for (unsigned long i = 0; i < count; ++i) {
      out << (out.tellp() > 0 ? " " : "") << token.substr(0, star);
      if (star != token.npos) out << i << '=' << i + 1;
    }
  }
  return out.str();
}

}  // namespace ksp::test
