#include <cstdint>
#include <cstring>
#include <string_view>

#include "context/append.h"
#include "context/decimal.h"
#include "ksp/error.h"
#include "ksp/statistics.h"
#include "stats/key_table.h"
#include "stats/stats_walk.h"

namespace ksp {
namespace {

// Each of the following adds one record that is not empty and returns the number of values dealt with, 0 when
// the walk is to end.

uint32_t addSingle(GenericParserContext* context, const StatsKey& key, const StatsRecord& record) {
  if (!appendEntry(context, record.elements(1)[0], key.name)) {
    SetAPIErrorMessage("KSPFTLParseBufferToCxt: %s(%u) cannot add 1 element to context", key.name.data(),
                       key.key);
  }
  return 1;
}

uint32_t addArray(GenericParserContext* context, const StatsKey& key, const StatsRecord& record) {
  if (record.count != key.count) {
    SetAPIErrorMessage("KSPFTLParseBufferToCxt: %s(%u): (#%u) cfg elements != (%u) buffer elements",
                       key.name.data(), key.key, key.count, record.count);
  }
  const Elements elements = record.elements(key.count);
  if (appendElements(context, elements, key.name, '_')) return elements.count;
  SetAPIErrorMessage("KSPFTLParseBufferToCxt: %s(%u): Cannot add %u elements to context", key.name.data(),
                     key.key, key.count);
  return 0;
}

uint32_t addByNumber(GenericParserContext* context, const StatsRecord& record) {
  char name[32] = "Stat_";
  char* end = writeDecimal(name + std::strlen(name), record.key);
  if (record.count > 1) *end++ = '_';
  const std::string_view stem(name, static_cast<size_t>(end - name));
  if (appendElements(context, record.elements(record.count), stem)) return record.count;
  // Both parsers report under this name.
  SetAPIErrorMessage("KSPFTLParseBufferToCxt %u: Cannot add %u elements to context", record.key,
                     record.count);
  return 0;
}

enum class Naming { kByKeyTable, kByNumber };

uint32_t parse(GenericParserContext* context, const void* stream, uint32_t length, Naming naming) {
  uint32_t total = 0;
  StatsWalk walk(stream, length, StatsFraming::kMarked);
  for (StatsRecord record; walk.next(record);) {
    if (record.isEmpty()) continue;
    const StatsKey* const key = naming == Naming::kByKeyTable ? findStatsKey(record.key) : nullptr;
    const uint32_t added = key == nullptr   ? addByNumber(context, record)
                           : key->isArray() ? addArray(context, *key, record)
                                            : addSingle(context, *key, record);
    if (added == 0) break;
    total += added;
  }
  return total;
}

}  // namespace
}  // namespace ksp

uint32_t KSPFTLParseBufferToCxt(GenericParserContext* context, const void* stream, uint32_t length) {
  return ksp::parse(context, stream, length, ksp::Naming::kByKeyTable);
}

uint32_t KSPFTLParseStatKeyBufferToCxt(GenericParserContext* context, const void* stream, uint32_t length) {
  return ksp::parse(context, stream, length, ksp::Naming::kByNumber);
}
