#pragma once

#include <charconv>
#include <concepts>
#include <string>
#include <string_view>

#include "tools/kspdump/capture.h"

namespace kspdump {

/// Appends a number in decimal.
template <std::integral Number>
void appendNumber(std::string& out, Number number) {
  char digits[24];
  out.append(digits, std::to_chars(digits, digits + sizeof digits, number).ptr);
}
void appendNumber(std::string& out, Wide number);

/// Appends a text as a JSON string; bytes that are not UTF-8 are replaced.
void appendJson(std::string& out, std::string_view text);

/// Appends a text as a CSV field.
void appendCsv(std::string& out, std::string_view text);

/// A text without anything that could steer a terminal.
std::string printable(std::string_view text);

/// Returns whether the locale's characters are UTF-8.
bool localeIsUtf8();

}  // namespace kspdump
