// SPDX-License-Identifier: Apache-2.0
#include "platform/host/log.h"

#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "platform/host/process.h"
#include "platform/system_log.h"

namespace host {

namespace {

/// Returns the bytes of the well-formed UTF-8 character that a text starts with, 0 where none does.
size_t characterLength(std::span<const char> text) {
  const auto byte = [&](size_t i) { return static_cast<unsigned char>(text[i]); };
  const size_t length = byte(0) < 0x80 ? 1 : byte(0) < 0xE0 ? 2 : byte(0) < 0xF0 ? 3 : 4;
  if (length == 1) return 1;
  if (byte(0) < 0xC2 || byte(0) > 0xF4 || text.size() < length) return 0;
  for (size_t i = 1; i < length; ++i) {
    if ((byte(i) & 0xC0) != 0x80) return 0;
  }
  const bool overlong = (byte(0) == 0xE0 && byte(1) < 0xA0) || (byte(0) == 0xF0 && byte(1) < 0x90);
  return overlong ? 0 : length;
}

/// C0, DEL and, in two bytes, C1.
bool isControl(std::span<const char> character) {
  const auto last = static_cast<unsigned char>(character.back());
  if (character.size() == 1) return last < ' ' || last == 0x7F;
  return character.size() == 2 && character.front() == '\xC2' && last < 0xA0;
}

}  // namespace

void makePrintable(std::span<char> text) {
  while (!text.empty()) {
    const size_t length = characterLength(text);
    const std::span<char> character = text.first(length == 0 ? 1 : length);
    if (length == 0 || isControl(character)) std::fill(character.begin(), character.end(), '?');
    text = text.subspan(character.size());
  }
}

void openLog() {
  const bool echo = isatty(STDERR_FILENO) != 0 || access(_PATH_LOG, W_OK) != 0;
  openlog(program_invocation_short_name, LOG_PID | (echo ? LOG_PERROR : 0), LOG_DAEMON);
}

void note(const char* format, ...) {
  char text[PATH_MAX + 256];
  va_list arguments;
  va_start(arguments, format);
  std::vsnprintf(text, sizeof text, format, arguments);
  va_end(arguments);
  makePrintable({text, std::strlen(text)});
  syslog(LOG_NOTICE, "host: %s", text);
}

void report(const char* line) {
  std::fprintf(stderr, "%s: %s\n", program_invocation_short_name, line);
}

}  // namespace host

void SystemLog(const char* format, ...) {
  host::bringUp();
  va_list arguments;
  va_start(arguments, format);
  vsyslog(LOG_NOTICE, format, arguments);
  va_end(arguments);
}
