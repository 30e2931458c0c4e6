// SPDX-License-Identifier: Apache-2.0
#include "ksp/statistics.h"
#include "tests/context_check.h"
#include "tests/plain_parsers.h"

using namespace ksp::test;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const auto length = static_cast<uint32_t>(size);
  require(agrees<ksp::GenericContext>(KSPFTLParseBufferToCxt, plainGeneric, data, length));
  require(agrees<ksp::GenericContext>(KSPFTLParseStatKeyBufferToCxt, plainStatKey, data, length));
  require(agrees<ksp::LegacyContext>(KSPParseBufferToCxt, plainLegacy, data, length));
  return 0;
}
