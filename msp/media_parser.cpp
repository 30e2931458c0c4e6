// SPDX-License-Identifier: Apache-2.0
#include <cstdint>

#include "context/append.h"
#include "ksp/error.h"
#include "ksp/media_statistics.h"
#include "ksp/records.hpp"

uint32_t KSPMSPParseBufferToCxt(GenericParserContext* context, const void* buffer, uint32_t length) {
  if (buffer == nullptr || length == 0) {
    SetAPIErrorMessage("KSPMSPParseBufferToCxt: Passed in invalid buffer or empty buffer");
    return 0;
  }
  uint32_t total = 0;
  ksp::MediaRecords records(buffer, length);
  for (const ksp::Record& record : records) {
    if (!record.counts || record.row == nullptr) continue;
    const ksp::MSPKeyEntry& row = *record.row;
    const char* const name = row.name.data();
    const unsigned count = row.count;
    if (!record.isAsConfigured()) {
      SetAPIErrorMessage(
          "KSPMSPParseBufferToCxt: %s(%u): cfg %u elements; (%u*%u) cfg bytes != (%u) buffer bytes", name,
          record.key, count, count, unsigned{row.width}, record.announced);
    }
    if (!ksp::appendElements(context, record.elements, row.name)) {
      SetAPIErrorMessage("KSPMSPParseBufferToCxt: %s(%u): Error adding %u elements to context", name,
                         record.key, count);
      break;
    }
    total += record.elements.size();
  }
  return total;
}
