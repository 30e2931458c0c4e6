// SPDX-License-Identifier: Apache-2.0
// A host file of any bytes is accepted with its numbers in their bounds, or refused with one printable line.

#include <clocale>
#include <cstdlib>
#include <cwchar>
#include <cwctype>

#include "platform/host/host_file.h"

namespace {

/// The C library's own view of the text, in a UTF-8 locale.
bool isPrintable(const char* text) {
  std::mbstate_t state = {};
  for (size_t left = std::char_traits<char>::length(text); left > 0;) {
    wchar_t character = 0;
    const size_t length = std::mbrtowc(&character, text, left, &state);
    if (length == 0 || length > left || std::iswcntrl(static_cast<wint_t>(character)) != 0) return false;
    text += length;
    left -= length;
  }
  return true;
}

void demand(bool holds) {
  if (!holds) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static const char* const locale = std::setlocale(LC_CTYPE, "C.UTF-8");
  demand(locale != nullptr);
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  try {
    const host::HostFile file = host::parseHostFile(text, "file");
    demand(file.activity.retrySeconds >= 1);
    demand(!file.yield.atCheck || *file.yield.atCheck >= 1);
    demand(!file.yield.ioPressurePercent || *file.yield.ioPressurePercent <= 100);
    demand(file.metricsFile.empty() || file.metricsFile.starts_with('/'));
    for (const host::ControllerSettings& controller : file.controllers) {
      demand(controller.tunnelMethod == 8 || controller.tunnelMethod == 9);
    }
  } catch (const host::HostFileError& fault) {
    demand(std::string_view(fault.what()).starts_with("file:") && isPrintable(fault.what()));
  }
  return 0;
}
