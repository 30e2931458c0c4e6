#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <vector>

#include "ksp/snapshot.h"
#include "snapshot/header.h"

using ksp::SnapshotHeader;

static void require(bool condition) {
  if (!condition) std::abort();
}

static bool growTo(std::vector<uint8_t>& header, uint64_t size) {
  if (size > 8192) return false;
  header.resize(std::max(header.size(), size_t{size}));
  return true;
}

// Two bytes of capacity, four of the cursor, two of the header's length; then the header and the records.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 8) return 0;
  const uint64_t capacity = ksp::loadWord(data) & 0xFFFF;
  uint32_t cursor = ksp::loadWord(data + 2);
  const uint8_t* middle = data + 8 + std::min<size_t>(ksp::loadWord(data + 4) >> 16, size - 8);
  std::vector<uint8_t> header(data + 8, middle);
  const std::vector<uint8_t> records(middle, data + size);
  ksp::snapshotHeaderFault(header.data(), header.size());

  // A caller has fetched what the header's own numbers claim.
  growTo(header, std::max<size_t>(header.size(), SnapshotHeader::kFixedBytes) + 1);
  const uint64_t table = uint64_t{SnapshotHeader(header.data()).tableOffset()} + 8;
  if (!growTo(header, table)) return 0;
  if (!growTo(header, table + uint64_t{28} * SnapshotHeader(header.data()).descriptorCount())) return 0;
  header.shrink_to_fit();
  require(ksp::snapshotHeaderFault(header.data(), header.size()) == nullptr);

  std::vector<char> out(capacity);
  uint32_t start = 0;
  int result = 0;
  do {
    start = cursor;
    uint64_t length = capacity;
    result = KSPParseSnapshotBufferWithInplaceParser(records.data(), records.size(), out.data(), &length,
                                                     header.data(), &cursor);
    require(capacity == 0 || (length <= capacity && out[length - 1] == '\0'));
    require(cursor >= start && (result == 1 || cursor - start <= records.size() / 4));
  } while (result == 0 && cursor != start);  // a heading that does not fit never will
  return 0;
}
