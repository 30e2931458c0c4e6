#include "tools/kspdump/text.h"

#include <langinfo.h>

#include <algorithm>
#include <nlohmann/json.hpp>

namespace kspdump {

void appendNumber(std::string& out, Wide number) {
  char digits[48];
  char* first = digits + sizeof digits;
  const bool negative = number < 0;
  do {
    const int digit = static_cast<int>(number % 10);
    *--first = static_cast<char>('0' + (negative ? -digit : digit));
    number /= 10;
  } while (number != 0);
  if (negative) *--first = '-';
  out.append(first, digits + sizeof digits);
}

std::string counted(uint64_t count, const char* noun) {
  return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

void appendJson(std::string& out, std::string_view text) {
  const bool plain = std::all_of(text.begin(), text.end(),
                                 [](char c) { return c >= ' ' && c < 0x7F && c != '"' && c != '\\'; });
  if (plain) {
    out.append("\"").append(text).append("\"");
  } else {
    out += nlohmann::json(text).dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
  }
}

void appendCsv(std::string& out, std::string_view text) {
  if (text.find_first_of("\",\r\n") == std::string_view::npos) {
    out += text;
    return;
  }
  out += '"';
  for (const char c : text) {
    if (c == '"') out += '"';
    out += c;
  }
  out += '"';
}

std::string printable(std::string_view text) {
  constexpr char kHex[] = "0123456789abcdef";
  const bool utf8 = localeIsUtf8();
  std::string safe;
  for (size_t i = 0; i < text.size(); ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    // The control characters above ASCII are two bytes in UTF-8.
    const bool control =
        byte < ' ' || byte == 0x7F ||
        (byte == 0xC2 && i + 1 < text.size() && static_cast<unsigned char>(text[i + 1]) < 0xA0);
    if (control || (!utf8 && byte >= 0x80)) {
      safe += {'\\', 'x', kHex[byte >> 4], kHex[byte & 0xF]};
    } else {
      safe += text[i];
    }
  }
  return safe;
}

bool localeIsUtf8() {
  static const bool utf8 = std::string_view(nl_langinfo(CODESET)) == "UTF-8";
  return utf8;
}

}  // namespace kspdump
