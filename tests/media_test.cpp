#include <gtest/gtest.h>

#include "ksp/media_statistics.h"
#include "msp/key_table.h"
#include "msp/msp_walk.h"
#include "tests/streams.h"

namespace ksp::test {
namespace {

using End = MSPWalk::End;

struct Case {
  const char* what;
  Stream stream;
  Entries expected;
  End end;
  size_t endOffset;
};

const Case kCases[] = {
    {"nothing", {}, {}, End::kComplete, 0},
    {"a single and an array before the end record",
     Stream().media(4096, 4).media(4254, 40).media(0x2FFF, 4).media(4097, 4),
     Entries{{"passWithTmodeHard", 1}} + numbered("cbdr_step_3", 10), End::kEndRecord, 52},
    {"an end record without its value", Stream().bytes(0x2FFF, 2).bytes(9, 2), {}, End::kEndRecord, 0},
    {"an empty end record",
     Stream().media(0x2FFF, 0).media(4096, 4),
     {{"passWithTmodeHard", 1}},
     End::kComplete,
     12},
    {"filler of an odd length",
     Stream().media(0x2FFE, 3).media(4096, 4),
     {{"passWithTmodeHard", 1}},
     End::kComplete,
     15},
    {"unknown keys",
     Stream().media(0, 4).media(4095, 1).media(4169, 4).media(12285, 4).media(65535, 2).media(4096, 4),
     {{"passWithTmodeHard", 1}},
     End::kComplete,
     43},
    {"a record one byte too long",
     Stream().media(4096, 4).bytes(4097, 2).bytes(5, 2).bytes(1, 4),
     {{"passWithTmodeHard", 1}},
     End::kOverrun,
     8},
    {"filler one byte too long", Stream().bytes(0x2FFE, 2).bytes(2, 2).bytes(1, 1), {}, End::kOverrun, 0},
    {"a truncated header",
     Stream().media(4096, 4).bytes(0, 3),
     {{"passWithTmodeHard", 1}},
     End::kTruncatedHeader,
     8},
    {"names that two keys bear", Stream().media(8212, 16).media(8220, 28),
     numbered("open_blocks_hist", 4) + numbered("open_blocks_hist", 7), End::kComplete, 52},
    {"the same key twice",
     Stream().media(4096, 4).media(4096, 4),
     {{"passWithTmodeHard", 1}, {"passWithTmodeHard", 1}},
     End::kComplete,
     16},
    {"no sign in either width",
     Stream().bytes(4096, 2).bytes(4, 2).bytes(~0U, 4).bytes(16384, 2).bytes(8, 2).bytes(0x8807060504030201,
                                                                                         8),
     {{"passWithTmodeHard", 4294967295}, {"fw_version_identifier", 0x8807060504030201}},
     End::kComplete,
     20},
};

TEST(Media, RecordsBecomeEntries) {
  for (const Case& c : kCases) {
    SCOPED_TRACE(c.what);
    GenericContext context;
    EXPECT_EQ(c.stream.run(KSPMSPParseBufferToCxt, context.get()), c.expected.size());
    EXPECT_EQ(entriesOf(context), c.expected);
    c.stream.run(
        [&](const void*, const void* stream, uint32_t length) {
          MSPWalk walk(stream, length);
          MSPRecord record;
          while (walk.next(record)) continue;
          EXPECT_EQ(walk.end(), c.end);
          EXPECT_EQ(record.offset, c.endOffset);
        },
        static_cast<const void*>(nullptr));
  }
}

TEST(Media, OnlyWholeConfiguredElementsAreTaken) {
  const struct {
    uint16_t key;
    uint16_t length;
    unsigned width;
    Entries expected;
  } cases[] = {
      {4096, 3, 4, {}},
      {4096, 7, 4, {{"passWithTmodeHard", 1}}},
      {4254, 6, 4, {{"cbdr_step_3", 1}}},
      {4254, 44, 4, numbered("cbdr_step_3", 10)},
      {4232, 300, 4, numbered("readStageNumOfFails108", 64)},
      {4233, 65535, 4, numbered("readStageNumOfFails103", 64)},
      {12288, 4, 8, {}},
      {12288, 15, 8, {{"readStageNumOfFails200", 1}}},
      {16385, 39, 8, numbered("random_read_size_ratio", 4)},
      {16385, 48, 8, numbered("random_read_size_ratio", 5)},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.key << ", " << c.length << " bytes");
    GenericContext context;
    const Stream stream = Stream().media(c.key, c.length, c.width).media(4097, 4);
    EXPECT_EQ(stream.run(KSPMSPParseBufferToCxt, context.get()), c.expected.size() + 1);
    const Entries last = {{"passWithTmodeFS1_2b", 1}};
    EXPECT_EQ(entriesOf(context), c.expected + last);
  }
}

TEST(Media, KeyTableCoversItsRanges) {
  const struct {
    uint16_t first;
    uint16_t last;
  } ranges[] = {{4096, 4168}, {4196, 4260}, {8193, 8249}, {12288, 12321}, {16384, 16388}};
  for (uint32_t key = 0; key <= UINT16_MAX; ++key) {
    bool known = false;
    for (const auto& range : ranges) known |= key >= range.first && key <= range.last;
    const MSPKeyEntry* const entry = LookupMSPKey(static_cast<uint16_t>(key));
    ASSERT_EQ(entry != nullptr, known) << key;
    ASSERT_TRUE(!known || (entry->key == key && entry->width == (key < 12288 ? 4 : 8))) << key;
  }
  unsigned singles = 0;
  for (const MSPKeyEntry& entry : mspKeyTable) singles += entry.count == 1;
  EXPECT_EQ(singles, 152U);
  EXPECT_EQ(std::string_view(LookupMSPKey(4168)->name), "DYCE2_Target_Bitflips");
  EXPECT_EQ(LookupMSPKey(4168)->count, 20);
}

}  // namespace
}  // namespace ksp::test
