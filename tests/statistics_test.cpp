#include "ksp/statistics.h"

#include <gtest/gtest.h>

#include <map>

#include "ksp/exporter.h"
#include "platform/driver_service.h"
#include "stats/key_table.h"
#include "stats/stats_walk.h"
#include "tests/streams.h"

const char PropertyMatchKey[] = "of this test";

namespace ksp::test {
namespace {

// What the three parsers make of one stream.
struct Case {
  const char* what;
  Stream stream;
  Entries byName;
  Entries byNumber;
  Entries legacy;
  int result;
};

const Case kCases[] = {
    {"nothing", {}, {}, {}, {}, 0},
    {"less than a word", Stream().bytes(4, 7), {}, {}, {}, 0},
    {"a word and a tail", Stream().header(4, 0).bytes(~0U, 7), {}, {}, {}, 1},
    {"records of all kinds",
     Stream().stat(4, {1234}).stat(298, {7, 9}).stat(900, {}).stat(0xFFFF, {5}),
     {{"hostWrites", 1234}, {"perHostReads_0", 7}, {"perHostReads_1", 9}},
     {{"Stat_4", 1234}, {"Stat_298_0", 7}, {"Stat_298_1", 9}},
     {{"hostWrites", 1234}, {"perHostReads0", 7}, {"perHostReads1", 9}},
     1},
    {"records behind an end marker",
     Stream().stat(1, {1}).stat(0xFFFF, {5}).stat(2, {7}),
     {{"version", 1}},
     {{"Stat_1", 1}},
     {{"version", 1}, {"hostWriteXacts", 7}},
     1},
    {"an end marker whose value is missing", Stream().header(0xFFFF, 1), {}, {}, {}, 0},
    {"empty records of special keys",
     Stream().stat(0xFFFF, {}).stat(1, {3}).stat(0x30000001, {}).stat(2, {4}),
     {{"version", 3}, {"hostWriteXacts", 4}},
     {{"Stat_1", 3}, {"Stat_2", 4}},
     {{"version", 3}},
     0},
    {"an empty single and an empty array", Stream().stat(4, {}).stat(14, {}), {}, {}, {}, 1},
    {"the greatest key",
     Stream().stat(0x30000000, {1}).stat(0x30000000, {2, 3}),
     {{"Stat_805306368", 1}, {"Stat_805306368_0", 2}, {"Stat_805306368_1", 3}},
     {{"Stat_805306368", 1}, {"Stat_805306368_0", 2}, {"Stat_805306368_1", 3}},
     {},
     1},
    {"a key above the greatest",
     Stream().stat(4, {1}).stat(0x30000001, {1}).stat(7, {2}),
     {{"hostWrites", 1}},
     {{"Stat_4", 1}},
     {{"hostWrites", 1}},
     0},
    {"a count that is one too large", Stream().stat(14, countUp(10)).header(4, 3).words({1, 2}),
     numbered("hostWriteLogHisto_", 10), numbered("Stat_14_", 10), numbered("hostWriteLogHisto", 10), 0},
    {"a count near the end of its range", Stream().header(4, ~0U).words({1}), {}, {}, {}, 0},
    {"a single with surplus values",
     Stream().stat(4, {1, 2, 3}).stat(7, {~uint64_t{0}}),
     {{"hostWrites", 1}, {"hostReads", ~uint64_t{0}}},
     numbered("Stat_4_", 3) + Entries{{"Stat_7", ~uint64_t{0}}},
     {{"hostWrites", 1}, {"hostReads", ~uint64_t{0}}},
     1},
    {"an array with surplus values", Stream().stat(14, countUp(12)).stat(1, {3}),
     numbered("hostWriteLogHisto_", 10) + Entries{{"version", 3}},
     numbered("Stat_14_", 12) + Entries{{"Stat_1", 3}},
     numbered("hostWriteLogHisto", 10) + Entries{{"version", 3}}, 1},
    {"short arrays", Stream().stat(14, {8}).stat(14, {1, 2, 3}),
     Entries{{"hostWriteLogHisto_", 8}} + numbered("hostWriteLogHisto_", 3),
     Entries{{"Stat_14", 8}} + numbered("Stat_14_", 3),
     Entries{{"hostWriteLogHisto", 8}} + numbered("hostWriteLogHisto", 3), 1},
    {"keys without a name",
     Stream().stat(0, {5}).stat(21, {6}).stat(827, {1, 2}),
     Entries{{"Stat_0", 5}, {"Stat_21", 6}} + numbered("Stat_827_", 2),
     Entries{{"Stat_0", 5}, {"Stat_21", 6}} + numbered("Stat_827_", 2),
     {},
     1},
};

TEST(Statistics, EachParserHasItsOwnView) {
  for (const Case& c : kCases) {
    SCOPED_TRACE(c.what);
    GenericContext byName;
    GenericContext byNumber;
    LegacyContext legacy;
    EXPECT_EQ(c.stream.run(KSPFTLParseBufferToCxt, byName.get()), c.byName.size());
    EXPECT_EQ(c.stream.run(KSPFTLParseStatKeyBufferToCxt, byNumber.get()), c.byNumber.size());
    EXPECT_EQ(c.stream.run(KSPParseBufferToCxt, legacy.get()), c.result);
    EXPECT_EQ(entriesOf(byName), c.byName);
    EXPECT_EQ(entriesOf(byNumber), c.byNumber);
    EXPECT_EQ(entriesOf(legacy), c.legacy);
    EXPECT_EQ(legacy->parseMarker, UINT32_MAX);
  }
}

TEST(Statistics, SummaryCopiesItsStatistics) {
  const auto valueOf = [](uint64_t key) { return key << 32 | (key + 1); };
  Stream stream;
  for (const uint32_t key :
       {4U, 7U, 12U, 13U, 17U, 18U, 19U, 20U, 28U, 45U, 48U, 49U, 50U, 51U, 52U, 53U, 56U}) {
    stream.stat(key, {1}).stat(key, {valueOf(key), 2});
  }
  stream.stat(265, countUp(6)).stat(265, {9, 8});
  LegacyContext c;
  ASSERT_EQ(stream.run(KSPParseBufferToCxt, c.get()), 1);
  const std::vector<uint64_t> low = {c->exportVersion, c->numVirtualBlocks, c->blocksPerVirtualBlock,
                                     c->pagesPerVirtualBlock, c->bytesPerPage};
  EXPECT_EQ(low, (std::vector<uint64_t>{54, 53, 52, 51, 50}));
  const std::vector<uint64_t> whole = {c->hostReads,      c->hostWrites,    c->numFreeVirtualBlocks,
                                       c->wearLevMoves,   c->nandReads,     c->nandWrites,
                                       c->bandErases,     c->IND_pool_free, c->IND_pool_count,
                                       c->utilFormatTime, c->numSleepOps,   c->maxHighEnduranceBlockErases};
  std::vector<uint64_t> expected;
  for (const uint64_t key : {7U, 4U, 48U, 17U, 19U, 18U, 20U, 12U, 13U, 56U, 28U, 45U})
    expected.push_back(valueOf(key));
  EXPECT_EQ(whole, expected);
  EXPECT_EQ(std::vector<uint64_t>(c->readCountHisto, c->readCountHisto + 5),
            (std::vector<uint64_t>{9, 8, 3, 4, 5}));
  EXPECT_EQ(c->reserved0 + c->reserved1[0] + c->reserved1[1] + c->reserved1[2] + c->reserved2, 0U);
  EXPECT_EQ(entriesOf(c)[1], (NamedValue{"hostWrites", valueOf(4)}));

  EXPECT_EQ(Stream().bytes(0, 7).run(KSPParseBufferToCxt, c.get()), 0);
  EXPECT_EQ(c->exportVersion, 54U) << "a stream without a word changes nothing";
  EXPECT_EQ(Stream().stat(53, {7}).header(1, 1).run(KSPParseBufferToCxt, c.get()), 0);
  EXPECT_EQ(c->exportVersion, 0U) << "a bad header takes back the version alone";
  EXPECT_EQ(c->hostWrites, valueOf(4));
}

TEST(Statistics, ArraysHaveAnUpperLimit) {
  GenericContext context;
  EXPECT_EQ(Stream().stat(900, countUp(65535)).run(KSPFTLParseBufferToCxt, context.get()), 65535U);
  EXPECT_EQ(entriesOf(context), numbered("Stat_900_", 65535));
  context.reset();
  EXPECT_EQ(
      Stream().stat(4, {1}).stat(900, countUp(65536)).stat(7, {1}).run(KSPFTLParseBufferToCxt, context.get()),
      1U);
  EXPECT_EQ(entriesOf(context), (Entries{{"hostWrites", 1}}));
}

TEST(Statistics, NullArguments) {
  const Stream stream = Stream().stat(1, {1}).stat(2, {2}).stat(14, countUp(10)).stat(3, {3});
  EXPECT_EQ(stream.run(KSPFTLParseBufferToCxt, static_cast<GenericParserContext*>(nullptr)), 2U);
  EXPECT_EQ(stream.run(KSPFTLParseStatKeyBufferToCxt, static_cast<GenericParserContext*>(nullptr)), 0U);
  EXPECT_EQ(stream.run(KSPParseBufferToCxt, static_cast<KSPParseContext*>(nullptr)), 0);
  GenericContext generic;
  LegacyContext legacy;
  EXPECT_EQ(KSPFTLParseBufferToCxt(generic.get(), nullptr, 16), 0U);
  EXPECT_EQ(KSPParseBufferToCxt(legacy.get(), nullptr, 16), 0);
  EXPECT_TRUE(entries(generic).empty() && entries(legacy).empty());
}

TEST(Statistics, KeyTableIsComplete) {
  std::map<unsigned, unsigned> keysOfCount;
  for (const StatsKey& key : kStatsKeys) {
    ++keysOfCount[key.count];
    EXPECT_EQ(findStatsKey(key.key), &key);
  }
  const std::map<unsigned, unsigned> expected = {
      {1, 535}, {2, 15}, {3, 3},  {4, 12}, {5, 12}, {6, 3},  {8, 12}, {9, 2},   {10, 23}, {11, 2}, {12, 2},
      {16, 9},  {20, 1}, {22, 3}, {30, 1}, {32, 9}, {45, 1}, {64, 2}, {100, 2}, {160, 1}, {256, 1}};
  EXPECT_EQ(keysOfCount, expected);
  for (const uint32_t key : {0U, 21U, 827U, 0xFFFFU, 0x10001U, ~0U}) EXPECT_EQ(findStatsKey(key), nullptr);
}

TEST(Statistics, WalkTellsWhereAndWhyItEnded) {
  using End = StatsWalk::End;
  const struct {
    Stream stream;
    End marked;
    End unmarked;
    size_t offset;
  } cases[] = {
      {{}, End::kComplete, End::kComplete, 0},
      {Stream().stat(4, {1}), End::kComplete, End::kComplete, 16},
      {Stream().stat(4, {1}).bytes(0, 3), End::kTail, End::kTail, 16},
      {Stream().stat(4, {1}).header(0xFFFF, 1), End::kEndMarker, End::kOverrun, 16},
      {Stream().stat(4, {1}).stat(0x30000001, {1}), End::kInvalidKey, End::kInvalidKey, 16},
      {Stream().stat(4, {1}).header(5, 2).words({1}), End::kOverrun, End::kOverrun, 16},
  };
  for (const auto& c : cases) {
    for (const auto framing : {StatsFraming::kMarked, StatsFraming::kUnmarked}) {
      c.stream.run(
          [&](const void*, const void* stream, uint32_t length) {
            StatsWalk walk(stream, length, framing);
            StatsRecord record;
            while (walk.next(record)) EXPECT_EQ(record.offset, 0U);
            EXPECT_EQ(walk.end(), framing == StatsFraming::kMarked ? c.marked : c.unmarked);
            EXPECT_EQ(record.offset, c.offset);
          },
          static_cast<const void*>(nullptr));
    }
  }
}

TEST(ParserSlots, LeadToTheParsersThatAControllerNeeds) {
  for (int row = 0; row < 3; ++row) {
    const ExporterEntry& entry = nand_exporters_tunnel[row];
    EXPECT_EQ(entry.parseBuffer, &KSPParseBufferToCxt);
    EXPECT_EQ(entry.releaseContext, &KSPReleaseContext);
    EXPECT_EQ(entry.parseFtlBuffer, &KSPFTLParseBufferToCxt);
    EXPECT_EQ(entry.parseStatKeyBuffer, &KSPFTLParseStatKeyBufferToCxt);
    EXPECT_EQ(entry.releaseGenericContext, &ReleaseGenericParserCxt);
    EXPECT_EQ(entry.parseMspBuffer != nullptr, row == 0);
    EXPECT_EQ(entry.getMspStatsSelector != nullptr, row == 0);
  }
  const ExporterEntry& last = nand_exporters_tunnel[3];
  EXPECT_TRUE(!last.parseBuffer && !last.releaseContext && !last.parseMspBuffer && !last.parseFtlBuffer &&
              !last.parseStatKeyBuffer && !last.releaseGenericContext);
}

}  // namespace
}  // namespace ksp::test
