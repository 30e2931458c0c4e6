// SPDX-License-Identifier: Apache-2.0
#include <sys/time.h>

#include <cstdint>
#include <ctime>
#include <optional>

#include "ksp/snapshot.h"
#include "numbers/format.h"
#include "snapshot/field_format.h"
#include "snapshot/header.h"
#include "snapshot/legend.h"
#include "snapshot/triples.h"
#include "snapshot/word.h"
#include "snapshot/writer.h"

namespace {

using ksp::FieldDescriptor;
using ksp::loadWord;
using ksp::PieceWriter;
using ksp::SnapshotHeader;

void writeCaptureTime(PieceWriter& page) {
  timeval now = {};
  gettimeofday(&now, nullptr);
  // Unlike localtime, which shares its result between threads, localtime_r need not look at TZ itself.
  tzset();
  std::tm local = {};
  localtime_r(&now.tv_sec, &local);
  char seconds[24];
  if (std::strftime(seconds, sizeof seconds, "%Y-%m-%d %H:%M:%S", &local) == 0) seconds[0] = '\0';
  page.print("Captured at: %s.%03d\n", seconds, static_cast<int>(now.tv_usec / 1000));
}

void writeHeading(PieceWriter& page, const SnapshotHeader& header) {
  if (!header.hasTitle()) {
    page.text(ksp::kLegend);
    return;
  }
  page.text("- KSP Snapshot - \n");
  page.text(header.title());
  page.text("\n");
}

void writeField(PieceWriter& page, const FieldDescriptor& field, const uint8_t* bytes) {
  switch (field.type) {
    case ksp::kFieldNumber:
    case ksp::kFieldOtherNumber:
      page.print(field.format, loadWord(bytes));
      break;
    case ksp::kFieldThousandths: {
      const ksp::Thousandths value(loadWord(bytes));
      page.print(field.format, value.whole, value.hundredths);
      break;
    }
    case ksp::kFieldTriples:
      ksp::writeTriples(page, bytes, field.size / ksp::kTripleBytes,
                        [&](const char* letter) { page.print(field.format, letter); });
      break;
    default:
      break;
  }
}

void writeLine(PieceWriter& page, const SnapshotHeader& header, const uint8_t* record) {
  const uint32_t count = header.descriptorCount();
  for (uint32_t i = 0; i < count && page.fits(); ++i) {
    const FieldDescriptor field = header.descriptor(i);
    if (header.holds(field) && ksp::formatIsSafe(field)) {
      writeField(page, field, record + field.offset);
    }
  }
  page.text("\n");
}

// Writes what fits, returns whether no record is left, and sets `kept` to the end of the last whole line.
bool writePage(PieceWriter& page, const void* records, uint64_t length, const SnapshotHeader& header,
               uint32_t& cursor, uint64_t& kept) {
  writeCaptureTime(page);
  if (cursor == 0) writeHeading(page, header);
  if (!page.fits()) return false;

  const uint32_t end = header.endOfRecords(length);
  const std::optional<uint32_t> key = header.keyOffset();
  if (!key && cursor < end) cursor = end;
  while (cursor < end) {
    const uint32_t offset = header.recordOffset(cursor++);
    const uint8_t* record = static_cast<const uint8_t*>(records) + offset;
    if (loadWord(record + *key) == 0) continue;
    writeLine(page, header, record);
    if (!page.fits()) return false;
    kept = page.length();
  }
  return true;
}

}  // namespace

int KSPParseSnapshotBufferWithInplaceParser(const void* records, uint64_t length, char* out, uint64_t* size,
                                            const void* header, uint32_t* cursor) {
  if (header == nullptr) return 0;
  PieceWriter page(out, *size);
  uint64_t kept = 0;
  const bool done = writePage(page, records, length, SnapshotHeader(header), *cursor, kept);
  if (*size > 0) out[kept] = '\0';
  *size = kept + 1;
  return done ? 1 : 0;
}
