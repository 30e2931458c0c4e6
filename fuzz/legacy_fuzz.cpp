#include "fuzz/context_check.h"
#include "ksp/statistics.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  ksp::LegacyContext context;
  return ksp::parseTwice(
      context, context->entries, KSPParseBufferToCxt, data, size, [&](int result, uint32_t) {
        ksp::require(context->parseMarker == UINT32_MAX && (result == 0 || (result == 1 && size >= 8)));
        ksp::require(result == 1 || context->exportVersion == 0);
      });
}
