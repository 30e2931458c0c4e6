// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <vector>

#include "ksp/snapshot.h"
#include "snapshot/header.h"
#include "tests/context_check.h"
#include "tests/plain_snapshot.h"

using namespace ksp::test;

static bool growTo(std::vector<uint8_t>& header, uint64_t size) {
  if (size > 8192) return false;
  header.resize(std::max(header.size(), size_t{size}));
  return true;
}

// Two bytes of capacity, four of the cursor, two of the header's length; then the header and the records.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 8) return 0;
  const uint64_t capacity = plainNumber(data, 2);
  auto cursor = static_cast<uint32_t>(plainNumber(data + 2, 4));
  const uint8_t* middle = data + 8 + std::min<size_t>(plainNumber(data + 6, 2), size - 8);
  std::vector<uint8_t> header(data + 8, middle);
  const std::vector<uint8_t> records(middle, data + size);
  ksp::snapshotHeaderFault(header.data(), header.size());

  // A caller has fetched what the header's own numbers claim.
  growTo(header, std::max<size_t>(header.size(), 36) + 1);
  const uint64_t table = plainNumber(header.data() + 24, 4) + 8;
  if (!growTo(header, table)) return 0;
  if (!growTo(header, table + 28 * plainNumber(header.data() + table - 8, 4))) return 0;
  header.shrink_to_fit();
  require(ksp::snapshotHeaderFault(header.data(), header.size()) == nullptr);

  std::string captured = "Captured at: 2026-11-16 17:30:05.007\n";
  std::vector<char> out(capacity);
  PlainPage expected;
  uint32_t start = 0;
  do {
    start = cursor;
    uint64_t length = capacity;
    const int result = KSPParseSnapshotBufferWithInplaceParser(records.data(), records.size(), out.data(),
                                                               &length, header.data(), &cursor);
    if (length > captured.size()) captured.assign(out.data(), captured.size());
    expected = plainPage(records.data(), records.size(), capacity, header.data(), start, captured);
    require(result == expected.result && cursor == expected.cursor && length == expected.text.size() + 1);
    require(capacity == 0 || out.data() == expected.text);
  } while (expected.result == 0 && cursor != start);  // a heading that does not fit never will
  return 0;
}
