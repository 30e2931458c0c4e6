// SPDX-License-Identifier: Apache-2.0
#include "controller/lookup.h"

#include <syslog.h>

namespace ksp {

void noticeFound(const char* operation, const ExporterEntry& row) {
  syslog(LOG_NOTICE, "Fendrel: %s: Controller found: %s\n", operation, row.className);
}

}  // namespace ksp

uint32_t findNandExporter(ExporterEntry** entry) {
  uint32_t found = 0;
  *entry = &ksp::findController([&](const ExporterEntry& row, uint32_t service) {
    ksp::noticeFound("findNandExporter", row);
    found = service;
    return true;
  });
  return found;
}
