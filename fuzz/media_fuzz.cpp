// SPDX-License-Identifier: Apache-2.0
#include "ksp/media_statistics.h"
#include "tests/context_check.h"
#include "tests/plain_parsers.h"

using namespace ksp::test;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  require(agrees<ksp::GenericContext>(KSPMSPParseBufferToCxt, plainMedia, data, static_cast<uint32_t>(size)));
  return 0;
}
