#include <algorithm>
#include <cstdint>

#include "context/append.h"
#include "ksp/error.h"
#include "ksp/media_statistics.h"
#include "msp/key_table.h"
#include "msp/msp_walk.h"

uint32_t KSPMSPParseBufferToCxt(GenericParserContext* context, const void* buffer, uint32_t length) {
  if (buffer == nullptr || length == 0) {
    SetAPIErrorMessage("KSPMSPParseBufferToCxt: Passed in invalid buffer or empty buffer");
    return 0;
  }
  uint32_t total = 0;
  ksp::MSPWalk walk(buffer, length);
  for (ksp::MSPRecord record; walk.next(record);) {
    if (record.isEmpty() || record.isFiller()) continue;
    const ksp::MSPKeyEntry* const key = ksp::LookupMSPKey(record.key);
    if (key == nullptr) continue;
    const unsigned number = key->key;
    const unsigned count = key->count;
    const unsigned width = key->width;
    ksp::Elements elements = {record.value, width, count};
    if (record.length != count * width) {
      SetAPIErrorMessage(
          "KSPMSPParseBufferToCxt: %s(%u): cfg %u elements; (%u*%u) cfg bytes != (%u) buffer bytes",
          key->name.data(), number, count, count, width, unsigned{record.length});
      elements.count = std::min(record.length / width, count);
    }
    if (!ksp::appendElements(context, elements, key->name)) {
      SetAPIErrorMessage("KSPMSPParseBufferToCxt: %s(%u): Error adding %u elements to context",
                         key->name.data(), number, count);
      break;
    }
    total += elements.count;
  }
  return total;
}
