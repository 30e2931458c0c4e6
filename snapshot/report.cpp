#include <cstdint>
#include <cstring>
#include <iterator>
#include <string_view>

#include "ksp/snapshot.h"
#include "snapshot/legend.h"
#include "snapshot/number.h"
#include "snapshot/triples.h"
#include "snapshot/writer.h"

namespace {

using ksp::loadWord;
using ksp::NumberFormat;

constexpr uint64_t kRecordBytes = 252;
constexpr size_t kWordBytes = 4;
constexpr size_t kPriorities = 4;

// Words of a record that are not just numbers with a label.
constexpr size_t kWriteTriples = 2;
constexpr size_t kReadTriples = 14;
constexpr size_t kHysteresis = 39;

struct Field {
  NumberFormat format;
  size_t word;
};

constexpr Field kBeforeHysteresis[] = {
    {"T=%04u", 0}, {" E=%02u", 26}, {" HR=%4u", 27}, {" HW=%4u", 28}, {" NR=%4u", 29}, {" NW=%4u", 30},
};

constexpr Field kAfterHysteresis[] = {
    {" GC=%4u", 31}, {" W=%2u", 33}, {" BI=%3u", 36}, {" BU=%3u", 37}, {" V=%5u", 45}, {" BF=%2u", 47},
    {"/%2u", 48},    {" P=%2u", 1},  {" H=%2u", 41},  {"/%2u", 40},    {" X=%2u", 50}, {"/%2u", 51},
    {" L=%3u", 43},  {"/%3u", 44},   {" C=%2u", 53},  {"/%2u", 54},    {" S=%4u", 42}, {" U=%8u", 52},
};

constexpr size_t kNumbers = std::size(kBeforeHysteresis) + 2 + std::size(kAfterHysteresis) +
                            2 * std::size(ksp::kTripleColumns) * kPriorities;

/// The line of one record, made where the longest one has room, so that no number needs a check of its own.
class Line {
 public:
  explicit Line(const uint8_t* record) {
    write(record, kBeforeHysteresis);
    const ksp::Thousandths hysteresis(loadWord(record + kWordBytes * kHysteresis));
    number(" TH=%8u", hysteresis.whole);
    number(".%02u", hysteresis.hundredths);
    write(record, kAfterHysteresis);
    write(record, " R", kReadTriples);
    write(record, " W", kWriteTriples);
    *end_++ = '\n';
  }

  std::string_view text() const { return {text_, end_}; }

  bool fits() const { return true; }
  void number(const NumberFormat& format, uint32_t value) { end_ = ksp::putNumber(end_, format, value); }

 private:
  template <size_t Count>
  void write(const uint8_t* record, const Field (&fields)[Count]) {
    for (const Field& field : fields) number(field.format, loadWord(record + kWordBytes * field.word));
  }

  void write(const uint8_t* record, const char (&direction)[3], size_t firstWord) {
    ksp::writeTriples(*this, record + kWordBytes * firstWord, kPriorities, [&](const char* letter) {
      const char label[] = {direction[0], direction[1], *letter, '='};
      std::memcpy(end_, label, sizeof label);
      end_ += sizeof label;
    });
  }

  char text_[kNumbers * ksp::kLongestNumber + ksp::kNumberRoom];
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
