// SPDX-License-Identifier: Apache-2.0
#include <vector>

#include "ksp/snapshot.h"
#include "tests/context_check.h"
#include "tests/plain_snapshot.h"

using namespace ksp::test;

// Two bytes of capacity, then records; the report must be, byte for byte, the one that snprintf makes.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 2) return 0;
  const uint64_t capacity = plainNumber(data, 2);
  const std::vector<uint8_t> records(data + 2, data + size);
  std::vector<char> out(capacity, 'z');
  std::vector<char> expected(capacity, 'z');
  uint64_t length = capacity;
  uint64_t expectedLength = capacity;
  const int result = KSPParseSnapshotBuffer(records.data(), records.size(), out.data(), &length);
  require(result == plainReport(records.data(), records.size(), expected.data(), &expectedLength));
  require(length == expectedLength && out == expected);
  return 0;
}
