#include "fuzz/context_check.h"
#include "ksp/media_statistics.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  return ksp::checkCounting(KSPMSPParseBufferToCxt, data, size);
}
