// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/text.h"

#include <langinfo.h>

#include <algorithm>
#include <charconv>
#include <nlohmann/json.hpp>

namespace kspdump {

namespace {

void appendSpelledOut(std::string& out, std::string_view bytes) {
  constexpr char kHex[] = "0123456789abcdef";
  for (const char byte : bytes) {
    out += {'\\', 'x', kHex[(byte >> 4) & 0xF], kHex[byte & 0xF]};
  }
}

/// Takes the next UTF-8 character from `text`; `character` is then its number. Returns its bytes, or some
/// that are none, with a number above all characters.
std::string_view takeCharacter(std::string_view& text, uint32_t& character) {
  constexpr uint32_t kNone = 0xFFFFFFFF;
  // The least number that may be written with so many bytes, and the bits of the first one that mark it.
  struct Form {
    uint32_t least;
    uint8_t mask;
    uint8_t mark;
  };
  constexpr Form kForms[] = {{0, 0x80, 0}, {0x80, 0xE0, 0xC0}, {0x800, 0xF0, 0xE0}, {0x10000, 0xF8, 0xF0}};
  const auto first = static_cast<uint8_t>(text[0]);
  const Form* const form = std::find_if(std::begin(kForms), std::end(kForms),
                                        [&](const Form& each) { return (first & each.mask) == each.mark; });
  const auto length = static_cast<size_t>(form - kForms) + 1;
  bool isSound = form != std::end(kForms) && length <= text.size();
  uint32_t number = isSound ? first & static_cast<uint8_t>(~form->mask) : 0;
  for (size_t i = 1; isSound && i < length; ++i) {
    isSound = (static_cast<uint8_t>(text[i]) & 0xC0) == 0x80;
    number = number << 6 | (static_cast<uint8_t>(text[i]) & 0x3F);
  }
  isSound = isSound && number >= form->least && (number < 0xD800 || number >= 0xE000);
  character = isSound ? number : kNone;
  const std::string_view taken = text.substr(0, isSound ? length : 1);
  text.remove_prefix(taken.size());
  return taken;
}

/// Whether a text is ASCII without controls.
bool isPlain(std::string_view text) {
  return std::all_of(text.begin(), text.end(), [](unsigned char c) { return c >= ' ' && c < 0x80; });
}

template <class MayStand>
std::string spelledOutUnless(std::string_view text, MayStand mayStand) {
  std::string out;
  while (!text.empty()) {
    uint32_t character = 0;
    const std::string_view bytes = takeCharacter(text, character);
    if (mayStand(character)) {
      out += bytes;
    } else {
      appendSpelledOut(out, bytes);
    }
  }
  return out;
}

}  // namespace

std::string fixed(double number, int decimals) {
  char text[512];  // any double fits
  const auto end = std::to_chars(text, std::end(text), number, std::chars_format::fixed, decimals).ptr;
  return {text, end};
}

std::string utf8(std::string_view text) {
  return spelledOutUnless(text, [](uint32_t character) { return character <= 0x10FFFF; });
}

bool isPlainJson(std::string_view text) {
  return isPlain(text) && text.find_first_of("\"\\") == std::string_view::npos;
}

void appendJson(std::string& out, std::string_view text) {
  if (isPlainJson(text)) {
    out.append("\"").append(text).append("\"");
  } else {
    out += nlohmann::json(utf8(text)).dump();
  }
}

void appendCsv(std::string& out, std::string_view text) {
  if (isPlain(text) && text.find_first_of("\",") == std::string_view::npos) {
    out += text;
    return;
  }
  out += '"';
  for (const char c : utf8(text)) {
    if (c == '"') out += '"';
    out += c;
  }
  out += '"';
}

namespace {

std::string legibleUpTo(uint32_t most, std::string_view text) {
  return spelledOutUnless(text, [&](uint32_t c) {
    const bool isControl = c < ' ' || (c >= 0x7F && c < 0xA0);
    const bool turnsText = (c >= 0x202A && c <= 0x202E) || (c >= 0x2066 && c <= 0x2069);
    return c <= most && !isControl && !turnsText;
  });
}

}  // namespace

std::string legible(std::string_view text) {
  return legibleUpTo(0x10FFFF, text);
}

std::string printable(std::string_view text) {
  return legibleUpTo(localeIsUtf8() ? 0x10FFFF : 0x7E, text);
}

void appendFindings(std::string& out, const Capture& capture, const std::string& source) {
  for (const Finding& finding : capture.findings) {
    out +=
        "! " + source + "offset " + std::to_string(finding.offset) + ": " + printable(finding.reason) + "\n";
  }
  if (capture.furtherFindings != 0) {
    out += "! " + source + counted(capture.furtherFindings, "further finding") + "\n";
  }
}

void appendFindings(std::string& out, const Series& series) {
  for (const Capture& capture : series.captures())
    appendFindings(out, capture, printable(capture.source) + ": ");
}

bool localeIsUtf8() {
  static const bool utf8 = std::string_view(nl_langinfo(CODESET)) == "UTF-8";
  return utf8;
}

}  // namespace kspdump
