// SPDX-License-Identifier: Apache-2.0
#include <cstdint>

#include "context/append.h"
#include "ksp/detail/key_name.hpp"
#include "ksp/error.h"
#include "ksp/records.hpp"
#include "ksp/statistics.h"

namespace ksp {
namespace {

/// Appends the values of a record, those of an array with an underscore and their index behind its name.
[[gnu::always_inline]] inline bool append(GenericParserContext* context, const Record& record,
                                          const KeyName& name) {
  if (record.isArray) return appendElements(context, record.elements, name, '_');
  return appendEntry(context, record.elements[0], name);
}

[[gnu::always_inline]] inline bool append(GenericParserContext* context, const Record& record) {
  // Most are listed: no name is made for these.
  return record.isListed() ? append(context, record, record.row->name)
                           : append(context, record, record.name().text());
}

/// Reports that a record could not be appended. Both parsers report under this name.
void reportLost(const Record& record) {
  if (!record.isListed()) {
    SetAPIErrorMessage("KSPFTLParseBufferToCxt %u: Cannot add %u elements to context", record.key,
                       record.announced);
  } else if (record.isArray) {
    SetAPIErrorMessage("KSPFTLParseBufferToCxt: %s(%u): Cannot add %u elements to context",
                       record.row->name.data(), record.key, record.configured);
  } else {
    SetAPIErrorMessage("KSPFTLParseBufferToCxt: %s(%u) cannot add 1 element to context",
                       record.row->name.data(), record.key);
  }
}

uint32_t parse(GenericParserContext* context, const void* stream, uint32_t length, StatisticsNaming naming) {
  uint32_t total = 0;
  StatisticsRecords records(stream, length, StatisticsFraming::kMarked, naming);
  for (const Record& record : records) {
    if (!record.counts) continue;
    if (record.isListed() && record.isArray && !record.isAsConfigured()) {
      SetAPIErrorMessage("KSPFTLParseBufferToCxt: %s(%u): (#%u) cfg elements != (%u) buffer elements",
                         record.row->name.data(), record.key, record.configured, record.announced);
    }
    if (!append(context, record)) {
      reportLost(record);
      // Without memory for a single value the walk goes on, and counts it.
      if (!record.isListed() || record.isArray) break;
    }
    total += record.elements.size();
  }
  return total;
}

}  // namespace
}  // namespace ksp

uint32_t KSPFTLParseBufferToCxt(GenericParserContext* context, const void* stream, uint32_t length) {
  return ksp::parse(context, stream, length, ksp::StatisticsNaming::kByTable);
}

uint32_t KSPFTLParseStatKeyBufferToCxt(GenericParserContext* context, const void* stream, uint32_t length) {
  return ksp::parse(context, stream, length, ksp::StatisticsNaming::kByNumber);
}
