// SPDX-License-Identifier: Apache-2.0
#include <cstdint>
#include <cstring>
#include <iterator>
#include <string_view>

#include "ksp/snapshot.h"
#include "numbers/format.h"
#include "snapshot/legend.h"
#include "snapshot/record_layout.h"
#include "snapshot/triples.h"
#include "snapshot/word.h"
#include "snapshot/writer.h"

namespace {

using ksp::kRecordBytes;
using ksp::kWordBytes;
using ksp::loadWord;
using ksp::NumberFormat;

// What a line is made of, besides its newline: numbers, and a label in front of each column of triples, of
// which there are two arrays.
constexpr size_t kColumns = 2 * std::size(ksp::kTripleColumns);
constexpr size_t kNumbers =
    std::size(ksp::kBeforeHysteresis) + 2 + std::size(ksp::kAfterHysteresis) + kColumns * ksp::kPriorities;
constexpr size_t kLabelLength = 4;
constexpr size_t kLongestLine = kNumbers * ksp::kLongestNumber + kColumns * kLabelLength + 1;

/// The line of one record, made where the longest one has room, so that no number needs a check of its own.
class Line {
 public:
  explicit Line(const uint8_t* record) {
    write(record, ksp::kBeforeHysteresis);
    const ksp::Thousandths hysteresis(loadWord(record + kWordBytes * ksp::kHysteresis));
    number(" TH=%8u", hysteresis.whole);
    number(".%02u", hysteresis.hundredths);
    write(record, ksp::kAfterHysteresis);
    write(record, " R", ksp::kReadTriples);
    write(record, " W", ksp::kWriteTriples);
    *end_++ = '\n';
  }

  std::string_view text() const { return {text_, end_}; }

  bool fits() const { return true; }
  void number(const NumberFormat& format, uint32_t value) { end_ = ksp::putNumber(end_, format, value); }

 private:
  template <size_t Count>
  void write(const uint8_t* record, const ksp::RecordField (&fields)[Count]) {
    for (const ksp::RecordField& field : fields)
      number(field.format, loadWord(record + kWordBytes * field.word));
  }

  void write(const uint8_t* record, const char (&direction)[3], size_t firstWord) {
    ksp::writeTriples(*this, record + kWordBytes * firstWord, ksp::kPriorities, [&](const char* letter) {
      const char label[kLabelLength] = {direction[0], direction[1], *letter, '='};
      std::memcpy(end_, label, sizeof label);
      end_ += sizeof label;
    });
  }

  // The last number may be stored with room behind it.
  char text_[kLongestLine + ksp::kNumberRoom - ksp::kLongestNumber];
  char* end_ = text_;
};

}  // namespace

int KSPParseSnapshotBuffer(const void* records, uint64_t length, char* out, uint64_t* size) {
  ksp::PieceWriter writer(out, *size);
  writer.text(ksp::kLegend);
  const auto* record = static_cast<const uint8_t*>(records);
  for (auto left = static_cast<uint32_t>(length / kRecordBytes); left > 0 && writer.fits(); --left) {
    writer.text(Line(record).text());
    record += kRecordBytes;
  }
  writer.text("\n");
  if (!writer.fits()) return 0;
  *size = writer.length();
  return 1;
}
