// SPDX-License-Identifier: Apache-2.0
#include <cstdarg>
#include <cstdio>
#include <cstdlib>

#include "ksp/error.h"

char* GlobalAPIErrorMessage = nullptr;

namespace {
constexpr size_t kMessageSize = 1024;
}  // namespace

void SetAPIErrorMessage(const char* format, ...) {
  if (GlobalAPIErrorMessage != nullptr) return;
  char* const message = static_cast<char*>(std::calloc(1, kMessageSize));
  if (message == nullptr) return;
  va_list arguments;
  va_start(arguments, format);
  static_cast<void>(std::vsnprintf(message, kMessageSize, format, arguments));
  va_end(arguments);
  GlobalAPIErrorMessage = message;
}

const char* GetAPIErrorMessage() {
  return GlobalAPIErrorMessage != nullptr ? GlobalAPIErrorMessage : "NA";
}
