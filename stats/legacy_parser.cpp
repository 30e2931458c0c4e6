// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <cstdint>
#include <limits>

#include "context/append.h"
#include "ksp/detail/elements.hpp"
#include "ksp/detail/key_name.hpp"
#include "ksp/records.hpp"
#include "ksp/statistics.h"
#include "ksp/summary.hpp"

namespace ksp {
namespace {

/// Appends one entry; without memory for it, nothing.
void AddSingleValueToKSPContext(KSPParseContext& context, const KeyName& name, uint64_t value) {
  appendEntry(&context.entries, value, name);
}

void AddMultipleFieldsToKSPContext(KSPParseContext& context, uint32_t key, const KeyName& name,
                                   const Elements& elements) {
  if (key == kReadCountHisto) {
    const uint32_t count = std::min(elements.size(), kReadCounts);
    for (uint32_t i = 0; i < count; ++i) context.readCountHisto[i] = elements[i];
  }
  appendElements(&context.entries, elements, name);
}

void addSingle(KSPParseContext& context, uint32_t key, const KeyName& name, uint64_t value) {
  if (const SummaryField* const field = findSummaryField(key)) field->store(context, value);
  AddSingleValueToKSPContext(context, name, value);
}

}  // namespace
}  // namespace ksp

int KSPParseBufferToCxt(KSPParseContext* context, const void* stream, uint32_t length) {
  if (context == nullptr) return 0;
  context->parseMarker = std::numeric_limits<uint32_t>::max();
  ksp::StatisticsRecords records(stream, length, ksp::StatisticsFraming::kUnmarked);
  for (const ksp::Record& record : records) {
    if (!record.counts || record.row == nullptr) continue;
    if (record.isArray) {
      ksp::AddMultipleFieldsToKSPContext(*context, record.key, record.row->name, record.elements);
    } else {
      ksp::addSingle(*context, record.key, record.row->name, record.elements[0]);
    }
  }
  if (records.ending().isBadHeader()) {
    context->exportVersion = 0;
    return 0;
  }
  // A stream that ends where it begins has no whole word.
  return records.ending().offset > 0 ? 1 : 0;
}
