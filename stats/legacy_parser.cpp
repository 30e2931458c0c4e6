#include <algorithm>
#include <cstdint>
#include <limits>

#include "context/append.h"
#include "context/key_index.h"
#include "ksp/statistics.h"
#include "stats/key_table.h"
#include "stats/stats_walk.h"
#include "stats/summary.h"

namespace ksp {
namespace {

void AddMultipleFieldsToKSPContext(KSPParseContext& context, uint32_t key, const KeyName& name,
                                   Elements elements) {
  if (key == kReadCountHisto) {
    const uint32_t count = std::min(elements.count, kReadCounts);
    for (uint32_t i = 0; i < count; ++i) context.readCountHisto[i] = elements[i];
  }
  appendElements(&context.entries, elements, name);
}

void addSingle(KSPParseContext& context, const StatsKey& key, uint64_t value) {
  if (const SummaryField* const field = findByKey<kSummaryFields>(key.key)) field->store(context, value);
  AddSingleValueToKSPContext(context, key.name, value);
}

}  // namespace
}  // namespace ksp

int KSPParseBufferToCxt(KSPParseContext* context, const void* stream, uint32_t length) {
  if (context == nullptr) return 0;
  context->parseMarker = std::numeric_limits<uint32_t>::max();
  ksp::StatsWalk walk(stream, length, ksp::StatsFraming::kUnmarked);
  if (walk.atEnd()) return 0;
  for (ksp::StatsRecord record; walk.next(record);) {
    const ksp::StatsKey* const key = ksp::findStatsKey(record.key);
    if (record.isEmpty() || key == nullptr) continue;
    const ksp::Elements elements = record.elements(key->count);
    if (key->isArray()) {
      ksp::AddMultipleFieldsToKSPContext(*context, key->key, key->name, elements);
    } else {
      ksp::addSingle(*context, *key, elements[0]);
    }
  }
  if (!walk.failed()) return 1;
  context->exportVersion = 0;
  return 0;
}
