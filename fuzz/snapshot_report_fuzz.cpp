#include <cstdint>
#include <cstdlib>
#include <vector>

#include "bench/plain_report.h"
#include "ksp/snapshot.h"

// Two bytes of capacity, then records; the report must be, byte for byte, the one that snprintf makes.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 2) return 0;
  const uint64_t capacity = uint64_t{data[0]} | uint64_t{data[1]} << 8;
  const std::vector<uint8_t> records(data + 2, data + size);
  std::vector<char> out(capacity, 'z');
  std::vector<char> expected(capacity, 'z');
  uint64_t length = capacity;
  uint64_t expectedLength = capacity;
  const int result = KSPParseSnapshotBuffer(records.data(), records.size(), out.data(), &length);
  const int expectedResult = plainReport(records.data(), records.size(), expected.data(), &expectedLength);
  if (result != expectedResult || length != expectedLength || out != expected) std::abort();
  return 0;
}
