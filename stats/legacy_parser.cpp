#include <algorithm>
#include <cstdint>
#include <limits>
#include <type_traits>

#include "context/append.h"
#include "context/key_index.h"
#include "ksp/statistics.h"
#include "stats/key_table.h"
#include "stats/stats_walk.h"

namespace ksp {
namespace {

/// A summary field that copies a single-valued statistic: its low 32 bits, or the whole value.
struct SummaryField {
  uint32_t key;
  uint32_t KSPParseContext::*low = nullptr;
  uint64_t KSPParseContext::*whole = nullptr;
};

constexpr SummaryField kSummaryFields[] = {
    {.key = 4, .whole = &KSPParseContext::hostWrites},
    {.key = 7, .whole = &KSPParseContext::hostReads},
    {.key = 12, .whole = &KSPParseContext::IND_pool_free},
    {.key = 13, .whole = &KSPParseContext::IND_pool_count},
    {.key = 17, .whole = &KSPParseContext::wearLevMoves},
    {.key = 18, .whole = &KSPParseContext::nandWrites},
    {.key = 19, .whole = &KSPParseContext::nandReads},
    {.key = 20, .whole = &KSPParseContext::bandErases},
    {.key = 28, .whole = &KSPParseContext::numSleepOps},
    {.key = 45, .whole = &KSPParseContext::maxHighEnduranceBlockErases},
    {.key = 48, .whole = &KSPParseContext::numFreeVirtualBlocks},
    {.key = 49, .low = &KSPParseContext::bytesPerPage},
    {.key = 50, .low = &KSPParseContext::pagesPerVirtualBlock},
    {.key = 51, .low = &KSPParseContext::blocksPerVirtualBlock},
    {.key = 52, .low = &KSPParseContext::numVirtualBlocks},
    {.key = 53, .low = &KSPParseContext::exportVersion},
    {.key = 56, .whole = &KSPParseContext::utilFormatTime},
};

constexpr uint32_t kReadCountHisto = 265;
constexpr uint32_t kReadCounts = std::extent_v<decltype(KSPParseContext::readCountHisto)>;

void AddMultipleFieldsToKSPContext(KSPParseContext& context, uint32_t key, const KeyName& name,
                                   Elements elements) {
  if (key == kReadCountHisto) {
    const uint32_t count = std::min(elements.count, kReadCounts);
    for (uint32_t i = 0; i < count; ++i) context.readCountHisto[i] = elements[i];
  }
  appendElements(&context.entries, elements, name);
}

void addSingle(KSPParseContext& context, const StatsKey& key, uint64_t value) {
  if (const SummaryField* const field = findByKey<kSummaryFields>(key.key)) {
    if (field->low != nullptr) {
      context.*field->low = static_cast<uint32_t>(value);
    } else {
      context.*field->whole = value;
    }
  }
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
